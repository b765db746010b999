#pragma once

#include <cstdio>

/// Prints a word when it is made, and another one when it is destroyed.
class Announcement {
 public:
  explicit Announcement(const char* name) : name_(name) { std::printf("%s\n", name_); }
  ~Announcement() { std::printf("end of %s\n", name_); }
  Announcement(const Announcement&) = delete;
  Announcement& operator=(const Announcement&) = delete;

 private:
  const char* name_;
};

void useInner();
void useOuter();

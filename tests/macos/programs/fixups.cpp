// Has every kind of fixup that the linker makes.

#include "fixups.h"

#include <array>
#include <cstddef>
#include <cstdint>

#include "Check.h"

extern "C" [[gnu::weak]] int noImageHasThisFunction();

// Other files could change these, so the compiler has to read them.
namespace places {

int own = 20;

// Pointers into the image, next to each other, with gaps, and on many pages.
struct Gap {
  const int* pointer;
  std::uint64_t number;
};
const int* volatile neighbours[] = {&own, &own, &own, &own, &own, &own, &own, &own, &own, &own,
                                    &own, &own, &own, &own, &own, &own, &own, &own, &own, &own};
Gap gaps[] = {{&own, 1}, {&own, 2}, {&own, 3}, {&own, 4}, {&own, 5}, {&own, 6}};
struct Page {
  const int* pointer;
  std::array<char, 4096> space;
};
Page pages[3] = {{&own, {}}, {&own, {}}, {&own, {}}};
struct Far {
  const int* first;
  std::array<char, 5000> space;
  const int* last;
};
Far farApart[2] = {{&own, {}, &own}, {&own, {}, &own}};

// Pointers into the library, with no addend, and with such that fit into 8 and 32 bits, and below zero.
int* volatile toLibrary = libraryNumbers;
int* volatile toLibraryNear = libraryNumbers + 3;
int* volatile toLibraryFar = libraryNumbers + 150'000;
int (*volatile toFunction)(int) = &libraryFunction;
int* volatile beforeLibrary = libraryNumbers - 2;

// Pointers to weak definitions.
int* volatile toShared = sharedVariable;
int* volatile toSharedWithAddend = sharedVariable + 2;

}  // namespace places

using namespace places;

int main() {
  bool areNeighboursRight = true;
  for (const int* pointer : neighbours) areNeighboursRight &= pointer == &own;
  check(areNeighboursRight, "pointers next to each other point to the variable");
  for (std::size_t at = 0; at < std::size(gaps); ++at) {
    check(gaps[at].pointer == &own && gaps[at].number == at + 1,
          "pointers with gaps, and only they, were changed");
  }
  for (const Page& page : pages) check(page.pointer == &own, "pointers on many pages point to the variable");
  for (const Far& each : farApart) check(each.first == &own && each.last == &own, "pointers far apart");

  check(*toLibrary == 10 && toLibrary == libraryNumbers, "a pointer into the library");
  check(*toLibraryNear == 13, "a pointer into the library with a small addend");
  check(toLibraryFar - libraryNumbers == 150'000, "a pointer into the library with a large addend");
  check(beforeLibrary + 2 == libraryNumbers, "an addend below zero");
  check(toFunction(1) == 2 && libraryFunction(2) == 3, "functions of the library");

  check(librarySharedVariable() == sharedVariable, "a weak variable is one for program and library");
  check(librarySharedValue() == &Shared<char>::value, "a static member of a template is one");
  check(toShared == sharedVariable && *toSharedWithAddend == 3, "pointers to a weak variable");
  check(librarySharedRange() == &sharedRange, "a weak constant is one");
  check(sharedRange.end - sharedRange.begin == 2 && *(sharedRange.end - 1) == 7,
        "an addend to a weak definition");
  check(&noImageHasThisFunction == nullptr, "a function that may be missing is null");
  return failures();
}

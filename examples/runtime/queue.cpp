// A queue that guards an account: what only its tasks touch needs no lock, and what a task throws reaches
// whoever waits for it.

#include <cstdio>
#include <stdexcept>

#include "Runtime/Runtime.h"

using namespace rt::literals;

class Account {
 public:
  void deposit(int amount) {
    queue_->async([this, amount] { balance_ += amount; });
  }

  // What is left. Throws std::runtime_error when there is not enough.
  int withdraw(int amount) {
    return queue_->sync([&] {
      if (amount > balance_) throw std::runtime_error("not enough");
      return balance_ -= amount;
    });
  }

 private:
  rt::Ref<rt::Queue> queue_ = rt::make<rt::Queue>("Account"_s);
  int balance_ = 0;
};

int main() {
  Account account;
  account.deposit(100);
  std::printf("%d left\n", account.withdraw(30));
  try {
    account.withdraw(100);
  } catch (const std::runtime_error& error) {
    std::printf("%s\n", error.what());
  }
}

// An account guarded by a queue. Data that only the queue's tasks use needs no lock. An exception from a task
// reaches the caller that waits for the task.

#include "Runtime/Queues/Queue.h"

#include <cstdio>
#include <stdexcept>

#include "Runtime/Objects/Ref.h"
#include "Runtime/Objects/String.h"

using namespace rt::literals;

class Account {
 public:
  void deposit(int amount) {
    queue_->async([this, amount] { balance_ += amount; });
  }

  // Returns the new balance. Throws std::runtime_error if the balance is too low.
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

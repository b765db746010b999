#include "Shared/ServiceRegistry/Source/Private/SRLTable.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <array>
#include <atomic>
#include <cstddef>
#include <map>
#include <memory>
#include <new>
#include <random>
#include <stdexcept>
#include <string>
#include <thread>
#include <utility>
#include <vector>

#include "tests/support/AllocationCount.h"

namespace {

using testing::IsEmpty;
using testing::UnorderedElementsAre;
using Table = SRLTable<int, std::string>;

TEST(SRLTable, IsEmptyAtFirst) {
  Table table;
  EXPECT_EQ(table.find(1), nullptr);
  EXPECT_EQ(std::as_const(table).find(0), nullptr);
  EXPECT_THAT(table.entries(), IsEmpty());
  EXPECT_EQ(table.entries().max_load_factor(), 1.0F);
  EXPECT_THAT(table.extract({}), IsEmpty());
}

TEST(SRLTable, KeepsTheFirstValueOfAKey) {
  Table table;
  const Table::Entry& entry = table.insert(1, "one");
  EXPECT_EQ(entry.first, 1);
  EXPECT_EQ(entry.second, "one");
  EXPECT_EQ(&table.insert(1, "another"), &entry);
  EXPECT_EQ(table.find(1), &entry);
  EXPECT_EQ(entry.second, "one");
  EXPECT_EQ(table.find(2), nullptr);
  EXPECT_THAT(table.entries(), UnorderedElementsAre(std::pair(1, "one")));
}

TEST(SRLTable, AddsADefaultValueForANewKey) {
  Table table;
  EXPECT_EQ(table[1], "");
  table[1] = "one";
  table[2] = "two";
  EXPECT_EQ(table[1], "one");
  EXPECT_THAT(table.entries(), UnorderedElementsAre(std::pair(1, "one"), std::pair(2, "two")));
}

TEST(SRLTable, IsCopiedWithItsEntries) {
  Table table;
  const Table copyOfNothing = table;
  for (int i = 0; i < 100; ++i) table[i] = std::to_string(i);
  const Table copy = table;
  table[7] = "changed";
  table[100] = "new";
  EXPECT_THAT(copyOfNothing.entries(), IsEmpty());
  EXPECT_EQ(copyOfNothing.find(7), nullptr);
  EXPECT_EQ(copy.entries().size(), 100U);
  EXPECT_EQ(copy.find(100), nullptr);
  for (int i = 0; i < 100; ++i) {
    const Table::Entry* entry = copy.find(i);
    ASSERT_NE(entry, nullptr);
    EXPECT_EQ(entry->second, std::to_string(i));
  }
}

std::vector<Table::Entries::const_iterator> iteratorsOf(const Table& table, bool (*isWanted)(int)) {
  std::vector<Table::Entries::const_iterator> wanted;
  for (auto entry = table.entries().begin(); entry != table.entries().end(); ++entry) {
    if (isWanted(entry->first)) wanted.push_back(entry);
  }
  return wanted;
}

TEST(SRLTable, ExtractsEntries) {
  Table table;
  for (int i = 0; i < 100; ++i) table[i] = std::to_string(i);
  const Table::Entry* kept = table.find(50);
  const auto nodes = table.extract(iteratorsOf(table, [](int key) { return key % 3 == 0; }));
  EXPECT_EQ(nodes.size(), 34U);
  for (const auto& node : nodes) {
    EXPECT_EQ(node.key() % 3, 0);
    EXPECT_EQ(node.mapped(), std::to_string(node.key()));
  }
  EXPECT_EQ(table.entries().size(), 66U);
  EXPECT_EQ(table.find(50), kept);
  for (int i = 0; i < 100; ++i) EXPECT_EQ(table.find(i) != nullptr, i % 3 != 0) << i;
  for (int i = 0; i < 200; ++i) table[i] = "again";
  EXPECT_EQ(table.entries().size(), 200U);
  table.extract(iteratorsOf(table, [](int) { return true; }));
  EXPECT_THAT(table.entries(), IsEmpty());
  EXPECT_EQ(table.find(50), nullptr);
}

// All hashes collide.
TEST(SRLTable, TellsKeysWithEqualHashesApart) {
  struct Constant {
    std::size_t operator()(int) const noexcept { return 42; }
  };
  SRLTable<int, int, Constant> table;
  for (int i = 0; i < 300; ++i) table[i] = 2 * i;
  for (int i = 0; i < 300; ++i) EXPECT_EQ(table[i], 2 * i);
  EXPECT_EQ(table.find(300), nullptr);
}

TEST(SRLTable, ErasesAnEntry) {
  Table table;
  table.erase(1);
  for (int i = 0; i < 100; ++i) table[i] = std::to_string(i);
  table.erase(50);
  table.erase(50);
  EXPECT_EQ(table.entries().size(), 99U);
  for (int i = 0; i < 100; ++i) EXPECT_EQ(table.find(i) != nullptr, i != 50) << i;
  EXPECT_EQ(table.insert(50, "again").second, "again");
}

TEST(SRLTable, DoesNotFindAPreparedEntry) {
  Table table;
  Table::Node node = table.prepare(1, 1);
  EXPECT_EQ(table.find(1), nullptr);
  EXPECT_THAT(table.entries(), IsEmpty());
  node.mapped() = "one";
  const Table::Entry& entry = table.insert(std::move(node));
  EXPECT_EQ(table.find(1), &entry);
  EXPECT_EQ(entry.second, "one");
  static_cast<void>(table.prepare(2, 1));
  EXPECT_EQ(table.find(2), nullptr);
  EXPECT_THAT(table.entries(), UnorderedElementsAre(std::pair(1, "one")));
}

// For any number of entries that are prepared before the first is inserted.
TEST(SRLTable, HasRoomForAllPreparedEntries) {
  if (!AllocationCount::isSupported()) GTEST_SKIP() << "no way to count allocations here";
  for (std::size_t known = 0; known < 40; ++known) {
    for (std::size_t prepared = 1; prepared < 40; ++prepared) {
      SRLTable<std::size_t, int> table;
      for (std::size_t key = 0; key < known; ++key) table[key] = 1;
      std::vector<SRLTable<std::size_t, int>::Node> nodes;
      while (nodes.size() < prepared) nodes.push_back(table.prepare(known + nodes.size(), nodes.size() + 1));
      const AllocationCount count;
      for (auto& node : nodes) table.insert(std::move(node));
      ASSERT_EQ(count.allocations(), 0) << known << " and " << prepared;
      for (std::size_t key = 0; key < known + prepared; ++key) ASSERT_NE(table.find(key), nullptr);
    }
  }
}

// Random operations on a table and on a map leave the same entries in both. The table's entries stay at their
// addresses.
TEST(SRLTable, BehavesLikeAMap) {
  std::mt19937 random(20261121);
  Table table;
  std::map<int, std::string> model;
  std::map<int, const Table::Entry*> places;
  for (int step = 0; step < 20000; ++step) {
    const int key = static_cast<int>(random() % 1000);
    switch (random() % 100) {
      case 0: {
        static int remainder = 0;
        remainder = key % 7;
        const auto gone = iteratorsOf(table, [](int each) { return each % 7 == remainder; });
        const auto nodes = table.extract(gone);
        for (const auto& node : nodes) {
          ASSERT_EQ(model.at(node.key()), node.mapped());
          model.erase(node.key());
          places.erase(node.key());
        }
        break;
      }
      case 1:
      case 2:
      case 3:
        table[key] = model[key] = std::to_string(step);
        places[key] = table.find(key);
        break;
      default:
        if (random() % 2 == 0) {
          const std::string value = std::to_string(step);
          model.try_emplace(key, value);
          places[key] = &table.insert(key, value);
        }
        const Table::Entry* entry = table.find(key);
        const auto expected = model.find(key);
        ASSERT_EQ(entry != nullptr, expected != model.end());
        if (entry == nullptr) break;
        ASSERT_EQ(entry->second, expected->second);
        ASSERT_EQ(entry, places.at(key));
    }
    ASSERT_EQ(table.entries().size(), model.size());
  }
  for (const auto& [key, value] : table.entries()) EXPECT_EQ(model.at(key), value);
}

// Comparing the key 13 throws.
TEST(SRLTable, IsUnchangedIfComparingKeysThrows) {
  struct Throwing {
    bool operator()(int first, int second) const {
      if (first == 13 || second == 13) throw std::runtime_error("13");
      return first == second;
    }
  };
  struct OneInTen {
    std::size_t operator()(int key) const noexcept { return static_cast<std::size_t>(key % 10); }
  };
  SRLTable<int, int, OneInTen, Throwing> table;
  table.insert(3, 3);
  EXPECT_THROW(table.find(13), std::runtime_error);
  EXPECT_THROW(table.insert(13, 13), std::runtime_error);
  EXPECT_THROW(table[13], std::runtime_error);
  EXPECT_EQ(table.entries().size(), 1U);
  EXPECT_EQ(table[3], 3);
}

TEST(SRLTable, IsUnchangedIfThereIsNoMemory) {
  struct Key {
    explicit Key(int given) : number(given) {}
    Key(const Key& other) : number(other.number) {
      if (number == 13) throw std::bad_alloc();
    }
    bool operator==(const Key& other) const { return number == other.number; }
    int number;
  };
  struct KeyHash {
    std::size_t operator()(const Key& key) const noexcept { return static_cast<std::size_t>(key.number); }
  };
  SRLTable<Key, std::string, KeyHash> table;
  table.insert(Key(1), "one");
  EXPECT_THROW(table.insert(Key(13), "thirteen"), std::bad_alloc);
  EXPECT_THROW(table[Key(13)], std::bad_alloc);
  table.tryInsert(Key(13), "thirteen");
  EXPECT_EQ(table.find(Key(13)), nullptr);
  table.tryInsert(Key(1), "another");
  table.tryInsert(Key(2), "two");
  EXPECT_EQ(table.entries().size(), 2U);
  EXPECT_EQ(table[Key(1)], "one");
  EXPECT_EQ(table[Key(2)], "two");
}

TEST(SRLTable, FindsWithoutAllocating) {
  if (!AllocationCount::isSupported()) GTEST_SKIP() << "no way to count allocations here";
  SRLTable<int, int> table;
  for (int i = 0; i < 100; ++i) table[i] = i;
  const AllocationCount count;
  for (int i = 0; i < 200; ++i) static_cast<void>(table.find(i));
  static_cast<void>(table.extract({}));
  EXPECT_EQ(count.allocations(), 0);
}

// A reader finds each announced key with its value. It finds other keys with their value or not at all. Every
// few keys, the writer waits until each reader has looked for a key.
TEST(SRLTable, CanBeLookedIntoWhileItGrows) {
  constexpr int kKeys = 5000;
  constexpr int kKeysAtATime = 250;
  constexpr unsigned kReaders = 3;
  SRLTable<int, std::unique_ptr<int>> table;
  std::atomic<int> inserted = 0;
  std::array<std::atomic<int>, kReaders> lookUps{};
  std::vector<std::thread> readers;
  readers.reserve(kReaders);
  for (unsigned reader = 0; reader < kReaders; ++reader) {
    readers.emplace_back([&table, &inserted, &count = lookUps.at(reader), reader] {
      std::mt19937 random(reader);
      int known = 0;
      while (known < kKeys) {
        known = inserted.load(std::memory_order_acquire);
        const int key = static_cast<int>(random() % kKeys);
        const auto* entry = std::as_const(table).find(key);
        if (key < known) {
          EXPECT_NE(entry, nullptr) << key;
        }
        if (entry != nullptr) {
          EXPECT_EQ(entry->first, key);
          EXPECT_EQ(*entry->second, 3 * key);
        }
        count.fetch_add(1, std::memory_order_relaxed);
      }
    });
  }
  for (int key = 0; key < kKeys; ++key) {
    table.insert(key, std::make_unique<int>(3 * key));
    inserted.store(key + 1, std::memory_order_release);
    if (key % kKeysAtATime != 0) continue;
    for (const std::atomic<int>& count : lookUps) {
      const int before = count.load(std::memory_order_relaxed);
      while (count.load(std::memory_order_relaxed) == before) std::this_thread::yield();
    }
  }
  for (std::thread& reader : readers) reader.join();
}

}  // namespace

// Tests the object file of the command's allocator. Its functions have other names here, so that this program
// keeps its own allocator. Every call uses up memory for good. Tests that need to know how much is left
// therefore run in a process of their own.

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <array>
#include <cerrno>
#include <cstddef>
#include <cstdint>
#include <cstdlib>
#include <cstring>
#include <span>

extern "C" {
void* command_malloc(std::size_t size);
void command_free(void* block);
void* command_calloc(std::size_t count, std::size_t size);
void* command_realloc(void* block, std::size_t size);
void* command_aligned_alloc(std::size_t alignment, std::size_t size);
}

namespace {

using testing::Each;

constexpr std::size_t kPiece = std::size_t{256} << 10;
constexpr std::size_t kHeader = 16;  // before each block

std::span<unsigned char> bytes(void* block, std::size_t size) {
  return {static_cast<unsigned char*>(block), size};
}

void fill(void* block, std::size_t size, unsigned char byte) {
  std::memset(block, byte, size);
}

bool isAligned(const void* block, std::size_t alignment) {
  return reinterpret_cast<std::uintptr_t>(block) % alignment == 0;
}

TEST(AllocationTest, ReturnsAlignedBlocksThatDoNotOverlap) {
  std::array<void*, 40> blocks{};
  for (std::size_t size = 0; size < blocks.size(); ++size) {
    blocks[size] = command_malloc(size);
    ASSERT_NE(blocks[size], nullptr);
    EXPECT_TRUE(isAligned(blocks[size], alignof(std::max_align_t))) << size;
    fill(blocks[size], size, static_cast<unsigned char>(size));
  }
  for (std::size_t size = 0; size < blocks.size(); ++size) {
    EXPECT_THAT(bytes(blocks[size], size), Each(size));
  }
}

TEST(AllocationTest, DoesNotReuseAFreedBlock) {
  void* const block = command_malloc(100);
  fill(block, 100, 7);
  command_free(block);
  command_free(nullptr);
  EXPECT_NE(command_malloc(100), block);
  EXPECT_THAT(bytes(block, 100), Each(7));
}

TEST(AllocationTest, CallocClearsEveryObject) {
  void* const before = command_malloc(1000);
  fill(before, 1000, 0xff);
  command_free(before);
  void* const block = command_calloc(10, 100);
  ASSERT_NE(block, nullptr);
  EXPECT_THAT(bytes(block, 1000), Each(0));
  fill(block, 1000, 0xff);
  fill(command_malloc(1), 1, 1);
  EXPECT_THAT(bytes(block, 1000), Each(0xff));
  EXPECT_NE(command_calloc(0, 100), nullptr);
  EXPECT_NE(command_calloc(100, 0), nullptr);
  EXPECT_NE(command_calloc(SIZE_MAX, 0), nullptr);
}

// As a number of this size, their product is 2.
TEST(AllocationTest, CallocDetectsOverflow) {
  errno = 0;
  EXPECT_EQ(command_calloc(SIZE_MAX / 2 + 2, 2), nullptr);
  EXPECT_EQ(errno, ENOMEM);
}

TEST(AllocationTest, ReallocCopiesWhatFits) {
  void* const block = command_malloc(48);
  fill(block, 48, 7);
  fill(command_malloc(48), 48, 8);  // a copy that goes too far would find this

  void* const larger = command_realloc(block, 200);
  ASSERT_NE(larger, nullptr);
  EXPECT_NE(larger, block);
  EXPECT_THAT(bytes(larger, 48), Each(7));
  EXPECT_THAT(bytes(larger, 200).subspan(48), Each(0)) << "more was copied than the block held";

  void* const smaller = command_realloc(larger, 20);
  ASSERT_NE(smaller, nullptr);
  EXPECT_THAT(bytes(smaller, 20), Each(7));
  EXPECT_THAT(bytes(smaller, 40).subspan(20), Each(0)) << "more was copied than was asked for";
  EXPECT_THAT(bytes(larger, 48), Each(7));
}

TEST(AllocationTest, ReallocKnowsTheSizeOfEachBlock) {
  void* const zeroes = command_calloc(4, 12);
  void* const aligned = command_aligned_alloc(256, 48);
  for (void* const block : {zeroes, aligned, command_realloc(zeroes, 48)}) {
    fill(block, 48, 9);
    fill(command_malloc(48), 48, 8);
    void* const larger = command_realloc(block, 100);
    EXPECT_THAT(bytes(larger, 48), Each(9));
    EXPECT_THAT(bytes(larger, 100).subspan(48), Each(0));
  }
}

TEST(AllocationTest, ReallocOfNullReturnsANewBlock) {
  void* const block = command_realloc(nullptr, 100);
  ASSERT_NE(block, nullptr);
  EXPECT_THAT(bytes(block, 100), Each(0));
}

TEST(AllocationTest, AlignsAsRequestedAndAtLeastAsUsual) {
  for (std::size_t alignment = 1; alignment <= 4096; alignment *= 2) {
    void* const before = command_malloc(1);
    fill(before, 1, 5);
    void* const block = command_aligned_alloc(alignment, 3);
    ASSERT_NE(block, nullptr);
    EXPECT_TRUE(isAligned(block, alignment)) << alignment;
    EXPECT_TRUE(isAligned(block, alignof(std::max_align_t))) << alignment;
    fill(block, 3, 6);
    EXPECT_THAT(bytes(before, 1), Each(5)) << alignment;
  }
}

TEST(AllocationTest, RefusesSizesAndAlignmentsThatDoNotFit) {
  for (const std::size_t size : {SIZE_MAX, SIZE_MAX - kHeader, SIZE_MAX / 2, kPiece + 1, kPiece}) {
    errno = 0;
    EXPECT_EQ(command_malloc(size), nullptr) << size;
    EXPECT_EQ(errno, ENOMEM) << size;
    EXPECT_EQ(command_realloc(nullptr, size), nullptr) << size;
    EXPECT_EQ(command_aligned_alloc(64, size), nullptr) << size;
  }
  for (std::size_t alignment = std::size_t{1} << 63; alignment >= 2 * kPiece; alignment /= 2) {
    errno = 0;
    void* const block = command_aligned_alloc(alignment, 1);
    // The memory may happen to lie at such an alignment.
    if (block != nullptr) continue;
    EXPECT_EQ(errno, ENOMEM) << alignment;
  }
  EXPECT_NE(command_malloc(1), nullptr);
}

TEST(AllocationTest, ReallocKeepsABlockThatItCannotResize) {
  void* const block = command_malloc(10);
  fill(block, 10, 7);
  EXPECT_EQ(command_realloc(block, SIZE_MAX), nullptr);
  EXPECT_THAT(bytes(block, 10), Each(7));
}

// Exits with 0 if the first block begins at the start of the memory and the last one ends at its end.
[[noreturn]] void takeAll() {
  auto* const first = static_cast<unsigned char*>(command_malloc(0));
  std::size_t size = kPiece;
  unsigned char* last = nullptr;
  while (last == nullptr) last = static_cast<unsigned char*>(command_malloc(size--));
  const bool isWhole = last + size + 1 == first - kHeader + kPiece;
  fill(last, size + 1, 1);
  const bool isExhausted = command_malloc(0) == nullptr && command_calloc(1, 1) == nullptr &&
                           command_aligned_alloc(1, 1) == nullptr && errno == ENOMEM;
  std::_Exit(isWhole && isExhausted ? 0 : 1);
}

TEST(AllocationDeathTest, HandsOutAllOfItsMemoryAndNoMore) {
  // The test program is started anew, so that no memory has been taken yet.
  GTEST_FLAG_SET(death_test_style, "threadsafe");
  EXPECT_EXIT(takeAll(), testing::ExitedWithCode(0), "");
}

}  // namespace

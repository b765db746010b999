#include "ThreadLocals.h"

#include <pthread.h>

#include <algorithm>
#include <array>
#include <cstdlib>
#include <mutex>

#include "Refusal.h"

namespace {

constexpr std::size_t kMostImages = 256;

// A variable's descriptor, as the linker lays it out: three words.
struct Descriptor {
  const void* function;
  std::uint64_t block;   // where the image's block is in `macosRunnerThreadBlocks`, in bytes
  std::uint64_t offset;  // of the variable in the block
};

using Blocks = std::array<void*, kMostImages>;

std::array<Image::ThreadLocals, kMostImages> templates;
std::size_t imageCount = 0;
std::mutex imagesLock;

void freeBlocks(void* blocks) {
  for (void*& block : *static_cast<Blocks*>(blocks)) {
    std::free(block);
    block = nullptr;
  }
}

// Has a value in each thread with blocks, so that the system calls `freeBlocks` when the thread ends.
pthread_key_t endOfThread() {
  static const pthread_key_t key = [] {
    pthread_key_t made{};
    if (pthread_key_create(&made, &freeBlocks) != 0) refuse("there is no key for thread-local variables");
    return made;
  }();
  return key;
}

}  // namespace

// The function of descriptors changes no register but the one with its result, not even those that functions
// may change. So it is written in assembly, as is the code around the first call of a thread.
extern "C" {
constinit thread_local Blocks macosRunnerThreadBlocks{};
void macosRunnerThreadLocalAddress();
void* macosRunnerAllocateThreadBlock(std::uint64_t block);
}

asm(R"(
  .text
  .globl macosRunnerThreadLocalAddress
  .type macosRunnerThreadLocalAddress, @function
macosRunnerThreadLocalAddress:
  endbr64
  movq macosRunnerThreadBlocks@gottpoff(%rip), %rax
  addq 8(%rdi), %rax
  movq %fs:(%rax), %rax
  testq %rax, %rax
  je 1f
  addq 16(%rdi), %rax
  ret
1:
  pushq %rbp
  movq %rsp, %rbp
  pushq %rdi
  pushq %rsi
  pushq %rdx
  pushq %rcx
  pushq %r8
  pushq %r9
  pushq %r10
  pushq %r11
  subq $512, %rsp
  andq $-16, %rsp
  fxsave64 (%rsp)
  movq 8(%rdi), %rdi
  call macosRunnerAllocateThreadBlock
  fxrstor64 (%rsp)
  leaq -64(%rbp), %rsp
  popq %r11
  popq %r10
  popq %r9
  popq %r8
  popq %rcx
  popq %rdx
  popq %rsi
  popq %rdi
  popq %rbp
  addq 16(%rdi), %rax
  ret
  .size macosRunnerThreadLocalAddress, . - macosRunnerThreadLocalAddress
)");

void* macosRunnerAllocateThreadBlock(std::uint64_t block) {
  const std::size_t number = block / sizeof(void*);
  const Image::ThreadLocals& variables = templates[number];
  void* memory = nullptr;
  if (posix_memalign(&memory, std::max(variables.alignment, sizeof(void*)), variables.size) != 0) {
    refuse("there is no memory for thread-local variables");
  }
  auto* const bytes = static_cast<std::byte*>(memory);
  std::fill_n(std::ranges::copy(variables.data, bytes).out, variables.size - variables.data.size(),
              std::byte{0});
  macosRunnerThreadBlocks[number] = memory;
  pthread_setspecific(endOfThread(), &macosRunnerThreadBlocks);
  return memory;
}

void prepareThreadLocals(const Image& image) {
  std::size_t number = kMostImages;
  for (const macho::Section& section : image.sections()) {
    if (section.type() == macho::SectionType::ThreadLocalInitialisers) {
      refuse("%s has initialisers of thread-local variables", image.path().c_str());
    }
    if (section.type() != macho::SectionType::ThreadLocalDescriptors) continue;
    if (number == kMostImages) {
      const std::lock_guard guard(imagesLock);
      endOfThread();
      if (imageCount == kMostImages) refuse("too many images have thread-local variables");
      number = imageCount++;
      templates[number] = image.threadLocals();
    }
    const std::span<std::byte> memory = image.memory(section);
    for (std::size_t at = 0; at + sizeof(Descriptor) <= memory.size(); at += sizeof(Descriptor)) {
      auto* const descriptor = static_cast<Descriptor*>(static_cast<void*>(memory.data() + at));
      descriptor->function = reinterpret_cast<const void*>(&macosRunnerThreadLocalAddress);
      descriptor->block = number * sizeof(void*);
    }
  }
}

const void* threadLocalBootstrap() {
  return reinterpret_cast<const void*>(
      +[] { refuse("a thread-local variable was used before it was prepared"); });
}

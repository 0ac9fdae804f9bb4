#include "tests/support/freed_memory_scan.h"

#include <execinfo.h>
#include <malloc.h>
#include <string.h>

#include <atomic>
#include <cstdlib>
#include <new>
#include <thread>

namespace ZyrdTest {
namespace {

std::atomic<const std::vector<std::string>*> active{nullptr};
std::thread::id starter;
bool othersOnly = false;
std::atomic<int> residues{0};
void* firstStack[32];
int firstDepth = 0;

void Inspect(void* p) {
  const std::vector<std::string>* secrets = active.load(std::memory_order_acquire);
  if (p == nullptr || secrets == nullptr) return;
  if (othersOnly && std::this_thread::get_id() == starter) return;
  const size_t size = malloc_usable_size(p);
  for (const auto& secret : *secrets) {
    if (memmem(p, size, secret.data(), secret.size()) != nullptr && residues.fetch_add(1) == 0) {
      firstDepth = backtrace(firstStack, 32);
    }
  }
}

}  // namespace

FreedMemoryScan::FreedMemoryScan(std::initializer_list<std::string_view> secrets, Threads threads)
    : secrets_(secrets.begin(), secrets.end()) {
  backtrace(firstStack, 1);  // loads the unwinder now rather than inside a release
  residues = 0;
  starter = std::this_thread::get_id();
  othersOnly = threads == Threads::kOthers;
  active.store(&secrets_, std::memory_order_release);
}

int FreedMemoryScan::Stop() {
  if (active.exchange(nullptr) == nullptr) return residues.load();
  if (residues.load() != 0) backtrace_symbols_fd(firstStack, firstDepth, 2);
  return residues.load();
}

}  // namespace ZyrdTest

// Blocks start zeroed, so that what a C library left in a block it freed
// itself is not taken for a copy the new owner left behind.
void* operator new(size_t size) {
  void* p = std::malloc(size == 0 ? 1 : size);
  if (p == nullptr) throw std::bad_alloc();
  return memset(p, 0, malloc_usable_size(p));
}
void operator delete(void* p) noexcept {
  ZyrdTest::Inspect(p);
  std::free(p);
}
void operator delete(void* p, size_t) noexcept {
  ZyrdTest::Inspect(p);
  std::free(p);
}

// The registry in threads. Each use of the heap comes back to it, as a program's own heap may: a
// lock that is held meanwhile would never be had. The preset tsan runs this.
#include <MemPool>

#include <algorithm>
#include <atomic>
#include <cstdlib>
#include <gtest/gtest.h>
#include <stdexcept>
#include <string>
#include <thread>
#include <vector>

#ifdef __unix__
#include <sys/wait.h>
#include <unistd.h>
#endif

using namespace VOK::MemPool;

__attribute__((noinline)) void* operator new(std::size_t size) {
  static_cast<void>(GetNumMgrs());
  return std::malloc(size);
}
__attribute__((noinline)) void operator delete(void* p) noexcept {
  static_cast<void>(GetNumMgrs());
  std::free(p);
}
__attribute__((noinline)) void operator delete(void* p, std::size_t) noexcept {
  operator delete(p);
}

namespace {

/// Makes, finds, lists and destroys pools of its own, and one whose name all threads want.
void Work(int thread, int numRounds) {
  const std::string name = "thread " + std::to_string(thread);
#ifdef _WIN32
  const Mgr untilTheEnd; // g++ frees a thread's own objects there before it destroys them
#else
  thread_local const Mgr untilTheEnd;
#endif
  for (int round = 0; round < numRounds; ++round) {
    Mgr own(name, Options().On());
    Mgr nameless;
    EXPECT_TRUE(own.Free(own.Alloc(10)));
    EXPECT_EQ(GetMgr(name.c_str()), &own);
    std::vector<Mgr*> all;
    GetMgrs(all);
    EXPECT_EQ(std::count(all.begin(), all.end(), &own), 1);
    EXPECT_EQ(std::count(all.begin(), all.end(), &untilTheEnd), 1);
    try {
      const Mgr wanted("wanted", Options());
    } catch (const std::invalid_argument&) { // another thread has it
    }
  }
}

TEST(Threads, MakeAndListPools) {
  std::vector<std::thread> threads;
  threads.reserve(4);
  for (int thread = 0; thread < 4; ++thread)
    threads.emplace_back(Work, thread, 300);
  for (std::thread& thread : threads)
    thread.join();
  EXPECT_EQ(GetNumMgrs(), 0U);
}

// A sanitizer's heap keeps its own locks over a fork.
#if defined(__unix__) && !defined(__SANITIZE_THREAD__) && !defined(__SANITIZE_ADDRESS__)
TEST(Threads, LeaveNoLockToAForkedChild) {
  if (VOK_MEMPOOL_EMULATED) return; // the emulator's own locks stay behind in a child
  std::atomic<bool> goesOn = true;
  std::thread other([&goesOn] {
    while (goesOn)
      Work(0, 1);
  });
  for (int i = 0; i < 100; ++i) {
    const pid_t child = fork();
    if (child == 0) {
      alarm(10);
      Work(1, 1);
      _exit(testing::Test::HasFailure() ? 1 : 0);
    }
    int status = -1;
    waitpid(child, &status, 0);
    EXPECT_EQ(status, 0);
  }
  goesOn = false;
  other.join();
}
#endif

} // namespace

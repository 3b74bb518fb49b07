// A program on the general heap, for the recorder: each function makes requests of its own.
#include <algorithm>
#include <cstdlib>
#include <cstring>
#include <malloc.h>
#include <sys/wait.h>
#include <thread>
#include <unistd.h>

namespace {

constexpr int numThreads = 4, numBlocks = 5000;
void* blocks[numThreads][numBlocks];

void Mallocs(int count) {
  for (int i = 0; i < count; ++i)
    blocks[0][i] = std::malloc(24);
  for (int i = 0; i < count; ++i)
    std::free(blocks[0][i]);
}

void* volatile kept[8]; // so that no request is optimised away

void News() {
  kept[0] = new long[3];
  delete[] static_cast<long*>(kept[0]);
}
void Callocs() { kept[1] = std::calloc(10, 10); }
void Aligned() {
  void* block = nullptr;
  if (posix_memalign(&block, 64, 100) == 0) kept[2] = block;
}
void Reallocs() {
  void* block = std::realloc(nullptr, 10);
  block = std::realloc(block, 100000);
  block = std::realloc(block, 20);
  kept[3] = std::realloc(block, 0); // frees
}

void Calls() {
  Mallocs(1000);
  News();
  Callocs();
  Aligned();
  Reallocs();
}

/// Each thread's blocks are freed by the main one.
void Threads() {
  std::thread threads[numThreads];
  std::ranges::transform(blocks, threads, [](auto& own) {
    return std::thread([&own] {
      for (void*& block : own)
        block = std::malloc(40);
    });
  });
  for (std::thread& thread : threads)
    thread.join();
  for (auto& own : blocks)
    for (void* block : own)
      std::free(block);
}

void Forks() {
  const pid_t child = fork();
  if (child == 0) {
    Mallocs(10);
    _exit(0);
  }
  waitpid(child, nullptr, 0);
}

/// A child's first request comes after the end of its parent.
void Orphan() {
  if (fork() != 0) _exit(0);
  usleep(200'000);
  Mallocs(10);
}

/// Ends at its peak, with one request in 40 near the size of a bucket, and one that no standard
/// allows.
void Keeps() {
  kept[0] = memalign(0, 24);
  for (int i = 0; i < 20000; ++i)
    kept[0] = std::malloc(i % 40 == 0 ? 3990 : 24);
  _exit(0);
}

} // namespace

int main(int argc, char** argv) {
  for (int i = 1; i < argc; ++i)
    if (std::strcmp(argv[i], "calls") == 0)
      Calls();
    else if (std::strcmp(argv[i], "threads") == 0)
      Threads();
    else if (std::strcmp(argv[i], "keep") == 0)
      Keeps();
    else if (std::strcmp(argv[i], "fork") == 0)
      Forks();
    else if (std::strcmp(argv[i], "orphan") == 0)
      Orphan();
    else if (std::strcmp(argv[i], "exec") == 0)
      execl(argv[0], argv[0], "calls", nullptr);
    else if (std::strcmp(argv[i], "kill") == 0)
      std::abort();
    else
      std::exit(std::atoi(argv[i]));
}

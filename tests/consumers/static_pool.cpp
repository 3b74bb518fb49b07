// A pool in a static object: the library's own objects are there before it and until it is gone.
#include <MemPool>

#include <iostream>

namespace {

struct Pool {
  ~Pool() {
    std::cout << (VOK::MemPool::GetMgr(mgr.GetName()) == &mgr ? "listed" : "lost") << '\n';
  }
  VOK::MemPool::Mgr mgr;
};

const Pool pool;

} // namespace

int main() { std::cout << (pool.mgr.IsEnabled() ? "enabled" : "disabled") << '\n'; }

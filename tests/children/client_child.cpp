// A program linked with the client library: its static pools stand before main and go after it.
#include "Script.h"
#include "pool_client.h"

int main() {
  Say("main begins");
  VOK::MemPool::Mgr* const mgr = poolClient.make();
  poolClient.report(mgr);
  poolClient.destroy(mgr);
  Say("main ends");
}

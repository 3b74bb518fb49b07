#include "support/Script.h"

#include <gtest/gtest.h>

using namespace VOK::MemPool;

namespace {

using Get = unsigned (*)();
using SetNumber = void (*)(unsigned);

TEST(Settings, Defaults) {
  EXPECT_EQ(ZOR_VOK_MEMPOOL_BUCKET_SIZE(), 4010u);
  EXPECT_EQ(ZOR_VOK_MEMPOOL_DATA_ALIGNMENT(), 4u);
  EXPECT_EQ(ZOR_VOK_MEMPOOL_MAX_RECORD_SIZE(), 1000u);
  EXPECT_EQ(ZOR_VOK_MEMPOOL_MIN_RECORD_SIZE(), 8u);
  EXPECT_FALSE(ZOR_VOK_MEMPOOL_KEEP_EMPTY_BUCKETS());
  EXPECT_FALSE(ZOR_VOK_MEMPOOL_TRACE());
  EXPECT_TRUE(ZOR_VOK_MEMPOOL_OFF());
  EXPECT_FALSE(ZOR_VOK_MEMPOOL_ON());
  EXPECT_STREQ(GetVersion(), "$Id: MemPool,v 1.2.52.4 2009/08/10 21:28:15 qrt Exp $");
}

// Every value is taken as it is, with no word about it, and changes no other setting.
TEST(Settings, FunctionsStoreAnything) {
  const KeepSettings keep;
  CaughtOutput output([] {});
  const struct {
    const char* name;
    Get get;
    SetNumber set;
    unsigned mask;
  } numbers[] = {
      {"bucket", ZOR_VOK_MEMPOOL_BUCKET_SIZE, ZOR_VOK_MEMPOOL_BUCKET_SIZE, 0xFFFFFFFF},
      {"align", ZOR_VOK_MEMPOOL_DATA_ALIGNMENT, ZOR_VOK_MEMPOOL_DATA_ALIGNMENT, 0xFFFF},
      {"max", ZOR_VOK_MEMPOOL_MAX_RECORD_SIZE, ZOR_VOK_MEMPOOL_MAX_RECORD_SIZE, 0xFFFFFFFF},
      {"min", ZOR_VOK_MEMPOOL_MIN_RECORD_SIZE, ZOR_VOK_MEMPOOL_MIN_RECORD_SIZE, 0xFFFFFFFF}};
  for (const auto& changed : numbers)
    for (const unsigned value :
         {0u, 1u, 3u, 32768u, 65535u, 65536u, 65537u, 0x80000000u, 0xFFFFFFFFu}) {
      for (const auto& other : numbers)
        other.set(77);
      changed.set(value);
      for (const auto& other : numbers)
        EXPECT_EQ(other.get(), other.name == changed.name ? value & changed.mask : 77)
            << other.name << " after " << changed.name << " = " << value;
    }
  for (const bool value : {true, false}) {
    ZOR_VOK_MEMPOOL_KEEP_EMPTY_BUCKETS(value);
    ZOR_VOK_MEMPOOL_TRACE(!value);
    ZOR_VOK_MEMPOOL_OFF(value);
    EXPECT_TRUE(ZOR_VOK_MEMPOOL_KEEP_EMPTY_BUCKETS() == value &&
                ZOR_VOK_MEMPOOL_TRACE() == !value && ZOR_VOK_MEMPOOL_OFF() == value &&
                ZOR_VOK_MEMPOOL_ON() == !value);
    ZOR_VOK_MEMPOOL_ON(value);
    EXPECT_TRUE(ZOR_VOK_MEMPOOL_ON() == value && ZOR_VOK_MEMPOOL_OFF() == !value);
  }
  EXPECT_EQ(output.Take(), "");
}

} // namespace

// The table of environment keys and its reader, the banner, and the exported functions.
// Test: tests/model_test.cpp, tests/process_test.py.
#include "services/Settings.h"

#include "MemPool"
#include "services/Messages.h"
#include "services/Observers.h"
#include "tarnkit/Tarn_Env.h"

#include <cstdlib>

namespace VOK::MemPool {

namespace Settings {

std::uint32_t bucketSize;
std::uint16_t dataAlignment;
std::uint32_t maxRecordSize;
std::uint32_t minRecordSize;
bool keepEmptyBuckets;
bool off;

namespace {

const char* const version = "$Id: MemPool,v 1.2.52.4 2009/08/10 21:28:15 qrt Exp $";

bool bannerWanted = false;

/// A key, whether it is looked up at all, and what its number does. A number that fails its test
/// is dropped in silence.
struct Key {
  const char* name;
  bool (*isOpen)();
  void (*take)(int n);
};

bool Always() { return true; }
bool WhileOff() { return off; }

// In the order of reading.
constexpr Key keys[] = {
    {"ZOR_VOK_MEMPOOL_ON", Always,
     [](int n) {
       if (n > 0) off = false;
     }},
    {"ZOR_MEMPOOL_ON", WhileOff,
     [](int n) {
       if (n > 0) off = false;
     }},
    {"ZOR_VOK_MEMPOOL_TRACE", Always,
     [](int n) {
       if (n > 0) Observers::SetTracing(true);
     }},
    {"ZOR_VOK_MEMPOOL_BUCKET_SIZE", Always,
     [](int n) {
       if (n >= 0) bucketSize = static_cast<std::uint32_t>(n);
     }},
    {"ZOR_VOK_MEMPOOL_MAX_RECORD_SIZE", Always,
     [](int n) {
       if (static_cast<std::uint32_t>(n) <= 32767) maxRecordSize = static_cast<std::uint32_t>(n);
     }},
    {"ZOR_VOK_MEMPOOL_MIN_RECORD_SIZE", Always,
     [](int n) {
       if (static_cast<std::uint32_t>(n) >= 4) minRecordSize = static_cast<std::uint32_t>(n);
     }},
    {"ZOR_VOK_MEMPOOL_DATA_ALIGNMENT", Always,
     [](int n) { dataAlignment = n > 0 ? static_cast<std::uint16_t>(n) : 1; }},
    {"ZOR_VOK_MEMPOOL_KEEP_EMPTY_BUCKETS", Always, [](int n) { keepEmptyBuckets = n > 0; }},
    {"ZOR_VOK_MEMPOOL_INFO", Always, [](int n) { bannerWanted = n >= 0; }},
};

void StoreDefaults() {
  bucketSize = 4010;
  maxRecordSize = 1000;
  minRecordSize = 8;
  dataAlignment = 4;
  keepEmptyBuckets = false;
  off = true;
}

void ReadKeys() {
  for (const Key& key : keys) {
    if (!key.isOpen()) continue;
    if (const char* const text = Tarn_Env::GetEnv(key.name)) key.take(std::atoi(text));
  }
}

void WriteBanner() {
  Messages::Info({"# ================================================"});
  Messages::Info({"# ZOR_VOK_MEMPOOL_INFO"});
  Messages::Info({"# ================================================"});
  Messages::Info({"# Version            : ", version});
  Messages::Info({"# Bucket Size        : ", bucketSize});
  Messages::Info({"# Data Alignment     : ", dataAlignment});
  Messages::Info({"# Keep Empty Buckets : ", keepEmptyBuckets});
  Messages::Info({"# Max Record Size    : ", maxRecordSize});
  Messages::Info({"# Min Record Size    : ", minRecordSize});
  Messages::Info({"# Trace              : ", Observers::IsTracing()});
  Messages::Info({"# Use Heap           : ", off});
}

} // namespace

void Load() {
  StoreDefaults();
  ReadKeys();
  if (bannerWanted) WriteBanner();
  if (minRecordSize >= maxRecordSize)
    Messages::RefuseLoad(
        {"MIN_RECORD_SIZE >= MAX_RECORD_SIZE (", minRecordSize, ">=", maxRecordSize, ")"});
}

} // namespace Settings

const char* GetVersion() { return Settings::version; }

unsigned ZOR_VOK_MEMPOOL_BUCKET_SIZE() { return Settings::bucketSize; }
void ZOR_VOK_MEMPOOL_BUCKET_SIZE(unsigned bytes) { Settings::bucketSize = bytes; }

unsigned ZOR_VOK_MEMPOOL_DATA_ALIGNMENT() { return Settings::dataAlignment; }
void ZOR_VOK_MEMPOOL_DATA_ALIGNMENT(unsigned bytes) {
  Settings::dataAlignment = static_cast<std::uint16_t>(bytes);
}

unsigned ZOR_VOK_MEMPOOL_MAX_RECORD_SIZE() { return Settings::maxRecordSize; }
void ZOR_VOK_MEMPOOL_MAX_RECORD_SIZE(unsigned bytes) { Settings::maxRecordSize = bytes; }

unsigned ZOR_VOK_MEMPOOL_MIN_RECORD_SIZE() { return Settings::minRecordSize; }
void ZOR_VOK_MEMPOOL_MIN_RECORD_SIZE(unsigned bytes) { Settings::minRecordSize = bytes; }

bool ZOR_VOK_MEMPOOL_KEEP_EMPTY_BUCKETS() { return Settings::keepEmptyBuckets; }
void ZOR_VOK_MEMPOOL_KEEP_EMPTY_BUCKETS(bool keep) { Settings::keepEmptyBuckets = keep; }

bool ZOR_VOK_MEMPOOL_TRACE() { return Observers::IsTracing(); }
void ZOR_VOK_MEMPOOL_TRACE(bool trace) { Observers::SetTracing(trace); }

bool ZOR_VOK_MEMPOOL_ON() { return !Settings::off; }
void ZOR_VOK_MEMPOOL_ON(bool on) { Settings::off = !on; }

bool ZOR_VOK_MEMPOOL_OFF() { return Settings::off; }
void ZOR_VOK_MEMPOOL_OFF(bool off) { Settings::off = off; }

} // namespace VOK::MemPool

// The table of settings, the reader of their environment keys, the banner, and the exported
// functions. Test: tests/model_test.cpp, tests/process_test.py.
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
bool checked;
bool endsAtFinding;

namespace {

bool bannerWanted;

/// A setting and its environment key. A number that fails its test is dropped without a message.
struct Setting {
  const char* key;
  int byDefault; ///< stored before any key is read
  bool (*counts)(int n);
  void (*store)(int n);
  const char* secondKey = nullptr; ///< looked up where the number of the first doesn't count
};

bool IsPositive(int n) { return n > 0; }
bool Any(int) { return true; }

// In the order of reading.
constexpr Setting settings[] = {
    {"ZOR_VOK_MEMPOOL_ON", 0, IsPositive, [](int n) { off = n <= 0; }, "ZOR_MEMPOOL_ON"},
    {"ZOR_VOK_MEMPOOL_TRACE", 0, IsPositive, [](int n) { Observers::SetTracing(n > 0); }},
    {"ZOR_VOK_MEMPOOL_BUCKET_SIZE", 4010, [](int n) { return n >= 0; },
     [](int n) { bucketSize = static_cast<std::uint32_t>(n); }},
    {"ZOR_VOK_MEMPOOL_MAX_RECORD_SIZE", 1000, [](int n) { return n >= 0 && n <= 32767; },
     [](int n) { maxRecordSize = static_cast<std::uint32_t>(n); }},
    {"ZOR_VOK_MEMPOOL_MIN_RECORD_SIZE", 8, [](int n) { return n < 0 || n >= 4; },
     [](int n) { minRecordSize = static_cast<std::uint32_t>(n); }},
    {"ZOR_VOK_MEMPOOL_DATA_ALIGNMENT", 4, Any,
     [](int n) { dataAlignment = n > 0 ? static_cast<std::uint16_t>(n) : 1; }},
    {"ZOR_VOK_MEMPOOL_KEEP_EMPTY_BUCKETS", 0, Any, [](int n) { keepEmptyBuckets = n > 0; }},
    {"ZOR_VOK_MEMPOOL_INFO", -1, [](int n) { return n >= 0; },
     [](int n) { bannerWanted = n >= 0; }},
    {"ZOR_VOK_MEMPOOL_CHECK", 0, IsPositive, [](int n) { checked = n > 0, endsAtFinding = n > 1; }},
};

/// Stores the number of an environment key; false if there is none that counts.
bool Read(const char* key, const Setting& setting) {
  const char* const text = Tarn_Env::GetEnv(key);
  if (text == nullptr) return false;
  const int n = std::atoi(text);
  if (!setting.counts(n)) return false;
  setting.store(n);
  return true;
}

void ReadKeys() {
  for (const Setting& setting : settings)
    if (!Read(setting.key, setting) && setting.secondKey != nullptr)
      Read(setting.secondKey, setting);
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
  for (const Setting& setting : settings)
    setting.store(setting.byDefault);
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

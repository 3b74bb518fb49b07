// The process-wide settings. A pool copies them when it is built. They are plain variables with no
// lock, and have no end of their own. The trace switch, which each event reads, is a bit of the
// byte that every request tests (services/Observers.h). Test: tests/model_test.cpp,
// tests/process_test.py.
#ifndef VOK_MEMPOOL_SETTINGS_H
#define VOK_MEMPOOL_SETTINGS_H

#include "base/Attributes.h"

#include <cstdint>

namespace VOK::MemPool::Settings {

/// The text of GetVersion, which names the form of the reports and no release.
inline constexpr char version[] = "$Id: MemPool,v 1.2.52.4 2009/08/10 21:28:15 qrt Exp $";

extern VOK_HIDDEN std::uint32_t bucketSize;
extern VOK_HIDDEN std::uint16_t dataAlignment;
extern VOK_HIDDEN std::uint32_t maxRecordSize;
extern VOK_HIDDEN std::uint32_t minRecordSize;
extern VOK_HIDDEN bool keepEmptyBuckets;
extern VOK_HIDDEN bool off;
extern VOK_HIDDEN bool checked;       ///< set by an environment key alone, as is the next
extern VOK_HIDDEN bool endsAtFinding; ///< a finding of a checked pool ends the process

/// Stores the defaults, reads the environment keys, writes the banner if a key asks for it, and
/// refuses the load with an exception if the smallest record is not below the largest.
/// Called once, while the library loads.
void Load();

} // namespace VOK::MemPool::Settings

#endif

// The attributes that keep the fast path straight-line code: what every request runs is inlined
// into one piece, what few requests run is out of line and is reached by a tail call.
// Test: scripts/checks/fast-path.
#ifndef VOK_MEMPOOL_ATTRIBUTES_H
#define VOK_MEMPOOL_ATTRIBUTES_H

#define VOK_ALWAYS_INLINE inline __attribute__((always_inline))
#define VOK_NOINLINE __attribute__((noinline))

// An extern variable is reached through the global offset table unless it is known to be ours.
#ifdef _WIN32
#define VOK_HIDDEN
#else
#define VOK_HIDDEN __attribute__((visibility("hidden")))
#endif

#endif

// The environment as the platform gives it.
// Test: tests/process_test.py.
#include "tarnkit/Tarn_Env.h"

#include <cstdlib>

const char* Tarn_Env::GetEnv(const char* key) {
#ifdef __linux__
  return secure_getenv(key);
#else
  return std::getenv(key);
#endif
}

// The one operation of the sibling library that the pools need: a look into the environment.
// Test: tests/process_test.py.
#ifndef TARN_ENV_H
#define TARN_ENV_H

class Tarn_Env {
public:
  /// The value of the key, null if it is not set or if the process runs with raised privileges,
  /// whose environment is its caller's. The text is the environment's; read it at once.
  /// Usable while static initialisers run.
  static const char* GetEnv(const char* key);
};

#endif

// Runs in which a call of the program fails; see fault_inject.cc.
#pragma once

#include <string>

#include "host_fixture.h"

// The `call`-th call of `operation` that the program makes, from 1, fails: with `status` where it
// gives one, else without a result. `operation` is one of the library's, or malloc, calloc or
// realloc; see fault_inject.cc.
inline Surroundings Failing(const std::string &operation, int call,
                            const std::string &status = "0xbad0001") {
  Surroundings surroundings;
  surroundings.environment = {
      "FAIL_OPERATION=" + operation,
      "FAIL_CALL=" + std::to_string(call),
      "FAIL_STATUS=" + status,
  };
  surroundings.preloaded = {FAULT_INJECT};
  return surroundings;
}

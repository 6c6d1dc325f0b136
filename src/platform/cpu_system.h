// SPDX-License-Identifier: MIT
// What the engine asks the system about processors.
#pragma once

#include <cstdint>

namespace n3ds {

// Where counts come from and where cores are switched. Only tests put something else here, before
// they make a pool, so that no test touches the real switches.
struct CpuSystem {
  long (*count)(int name);  // as sysconf, for _SC_NPROCESSORS_CONF and _SC_NPROCESSORS_ONLN
  const char* directory;    // holds cpu0/online, cpu1/online, ...
};
extern CpuSystem cpu_system;

// At least 1, also when the system cannot tell.
uint32_t ConfiguredCpus();
uint32_t OnlineCpus();

}  // namespace n3ds

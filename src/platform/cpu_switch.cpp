// SPDX-License-Identifier: MIT
// Processor counts, and the two operations that bring offline cores online and restore them.
//
// Both stop silently at the first file that cannot be opened: apps usually lack permission, and
// many kernels have no switch for core 0.
#include <unistd.h>

#include <algorithm>
#include <cstdio>

#include "norvale_3d_sticker_core.h"
#include "platform/cpu_system.h"
#include "platform/scratch_array.h"
#include "platform/task_pool.h"

namespace n3ds {

CpuSystem cpu_system = {sysconf, "/sys/devices/system/cpu"};

namespace {

uint32_t CpuCount(int name) { return static_cast<uint32_t>(std::max(cpu_system.count(name), 1L)); }

FILE* OpenSwitch(uint32_t core, const char* mode) {
  char path[512];
  const int length =
      std::snprintf(path, sizeof(path), "%s/cpu%u/online", cpu_system.directory, core);
  if (length < 0 || static_cast<size_t>(length) >= sizeof(path)) return nullptr;
  return std::fopen(path, mode);
}

bool ReadSwitch(uint32_t core, uint32_t* online) {
  FILE* file = OpenSwitch(core, "rt");
  if (file == nullptr) return false;
  char state = 0;
  const bool read = std::fread(&state, 1, 1, file) == 1;
  std::fclose(file);
  *online = state >= '1' && state <= '9' ? 1 : 0;
  return read;
}

bool WriteSwitch(uint32_t core, uint32_t online) {
  FILE* file = OpenSwitch(core, "wt");
  if (file == nullptr) return false;
  const bool written = std::fputc(online != 0 ? '1' : '0', file) != EOF;
  // The kernel sees the digit, and may refuse it, when the buffer is flushed.
  return std::fclose(file) == 0 && written;
}

}  // namespace

uint32_t ConfiguredCpus() { return CpuCount(_SC_NPROCESSORS_CONF); }

uint32_t OnlineCpus() { return CpuCount(_SC_NPROCESSORS_ONLN); }

}  // namespace n3ds

void mcvTryFireCpu(void* pool) {
  if (pool == nullptr) return;
  n3ds::TaskPool* context = static_cast<n3ds::TaskPool*>(pool);
  const uint32_t configured = n3ds::ConfiguredCpus();
  const uint32_t online = n3ds::OnlineCpus();

  const n3ds::ScratchArray<uint32_t> states(context->memory, configured);
  if (!states) return;
  for (uint32_t core = 0; core < configured; ++core) {
    if (!n3ds::ReadSwitch(core, &states[core])) return;
  }
  std::copy_n(states.get(), std::min(configured, n3ds::kMaxWorkers), context->savedCpuOnline);
  if (online >= configured) return;

  context->cpusFired = 1;
  uint32_t offline = configured - online;
  for (uint32_t core = 0; core < configured && offline > 0; ++core) {
    if (states[core] != 0) continue;
    if (!n3ds::WriteSwitch(core, 1)) return;
    --offline;
  }
}

void mcvTryRestoreCpu(void* pool) {
  if (pool == nullptr) return;
  n3ds::TaskPool* context = static_cast<n3ds::TaskPool*>(pool);
  if (context->cpusFired == 0) return;
  for (uint32_t core = 0; core < context->configuredCpus; ++core) {
    if (!n3ds::WriteSwitch(core, context->savedCpuOnline[core])) break;
  }
  context->cpusFired = 0;
}

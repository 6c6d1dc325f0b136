// SPDX-License-Identifier: MIT
// Ends a test that never returns, long before ctest would.
#pragma once

#include <unistd.h>

#include <csignal>
#include <cstdlib>
#include <string_view>

namespace n3ds::testing {

// While one lives, the program aborts when `seconds` have passed. An alarm, not a thread, so that
// tests may count threads. At most one at a time.
class Watchdog {
 public:
  explicit Watchdog(unsigned seconds) {
    std::signal(SIGALRM, [](int) {
      constexpr std::string_view kMessage = "Watchdog: the test does not end\n";
      if (write(STDERR_FILENO, kMessage.data(), kMessage.size()) < 0) _exit(1);
      std::abort();
    });
    alarm(seconds);
  }
  ~Watchdog() {
    alarm(0);
    std::signal(SIGALRM, SIG_DFL);
  }
  Watchdog(const Watchdog&) = delete;
  Watchdog& operator=(const Watchdog&) = delete;
};

}  // namespace n3ds::testing

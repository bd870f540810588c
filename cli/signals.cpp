#include "cli/signals.h"

#include <atomic>
#include <csignal>
#include <system_error>
#include <thread>

#include "cli/temporary_file.h"

namespace orvalis::cli {
namespace {

std::atomic<bool> survives_interrupt{false};

/// A thread may do what a signal handler may not: wait for a lock.
[[noreturn]] void wait_for(sigset_t awaited) {
  for (;;) {
    int number = 0;
    if (sigwait(&awaited, &number) != 0) continue;
    if (number == SIGINT && survives_interrupt.exchange(false)) continue;
    TemporaryFile::remove_all();
    std::signal(number, SIG_DFL);
    pthread_sigmask(SIG_UNBLOCK, &awaited, nullptr);
    std::raise(number);
  }
}

}  // namespace

void watch_signals() {
  sigset_t awaited, before;
  sigemptyset(&awaited);
  for (const int number : {SIGINT, SIGTERM, SIGHUP}) {
    struct sigaction action {};
    if (sigaction(number, nullptr, &action) == 0 && action.sa_handler != SIG_IGN)
      sigaddset(&awaited, number);
  }
  // All later threads inherit the mask.
  pthread_sigmask(SIG_BLOCK, &awaited, &before);
  try {
    std::thread(wait_for, awaited).detach();
  } catch (const std::system_error &) {
    pthread_sigmask(SIG_SETMASK, &before, nullptr);
  }
}

void survive_one_interrupt() { survives_interrupt = true; }

}  // namespace orvalis::cli

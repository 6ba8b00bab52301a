#include "fs/walk.h"

#include <array>
#include <cerrno>
#include <csetjmp>
#include <csignal>
#include <cstdint>

namespace fs {
namespace {

// NOLINTNEXTLINE(cppcoreguidelines-avoid-non-const-global-variables): a handler can see no other
sigjmp_buf after_fts_open;

/// Leaves fts_open at a write through a null pointer; any other fault goes on to end the process.
void leave_fts_open(int /*signal*/, siginfo_t* fault, void* /*context*/) {
  constexpr std::uintptr_t first_page = 4096;
  const auto address = reinterpret_cast<std::uintptr_t>(fault->si_addr);
  if (fault->si_code == SEGV_MAPERR && address < first_page) ::siglongjmp(after_fts_open, 1);
  static_cast<void>(std::signal(SIGSEGV, SIG_DFL));
}

}  // namespace

// The C library's fts_open (glibc 2.36 at least) does not check its allocation of the root's entry
// and writes through the null pointer. While it runs, and only then, that is taken for the lack of
// memory that it is. What it had allocated by then is lost, which a run this short can bear.
walk open_walk(std::string root) {
  const std::array<char*, 2> roots = {root.data(), nullptr};
  struct sigaction previous {};
  struct sigaction action {};
  action.sa_sigaction = leave_fts_open;
  action.sa_flags = SA_SIGINFO | SA_NODEFER;
  ::sigaction(SIGSEGV, &action, &previous);

  FTS* volatile opened = nullptr;
  if (sigsetjmp(after_fts_open, 0) == 0) {
    opened = ::fts_open(roots.data(), FTS_COMFOLLOW | FTS_PHYSICAL | FTS_XDEV, nullptr);
  } else {
    errno = ENOMEM;
  }
  ::sigaction(SIGSEGV, &previous, nullptr);
  return {opened, ::fts_close};
}

}  // namespace fs

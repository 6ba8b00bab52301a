#include "fs/walk.h"

#include <array>
#include <cerrno>
#include <csetjmp>
#include <csignal>

namespace fs {
namespace {

// NOLINTNEXTLINE(cppcoreguidelines-avoid-non-const-global-variables): a handler can see no other
sigjmp_buf unchecked_allocation;

}  // namespace

// The C library's fts_open (glibc 2.36 at least) does not check its allocation of the root's entry
// and writes through the null pointer. While it runs, and only then, that is taken for the lack of
// memory that it is. What it had allocated by then is lost, which a run this short can bear.
walk open_walk(std::string root) {
  const std::array<char*, 2> roots = {root.data(), nullptr};
  struct sigaction previous {};
  struct sigaction action {};
  action.sa_handler = [](int) { ::siglongjmp(unchecked_allocation, 1); };
  action.sa_flags = SA_NODEFER;
  ::sigaction(SIGSEGV, &action, &previous);

  FTS* volatile opened = nullptr;
  if (sigsetjmp(unchecked_allocation, 0) == 0) {
    opened = ::fts_open(roots.data(), FTS_COMFOLLOW | FTS_PHYSICAL | FTS_XDEV, nullptr);
  } else {
    errno = ENOMEM;
  }
  ::sigaction(SIGSEGV, &previous, nullptr);
  return {opened, ::fts_close};
}

}  // namespace fs

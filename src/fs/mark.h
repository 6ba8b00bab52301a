#pragma once

#include <unistd.h>

#include <cerrno>

namespace fs {

/// Stands at a path for the length of a scope: a link to ".", so that `exists` sees it. One that is
/// there already is taken over; where none can be made, the scope goes on without. Prints nothing,
/// and leaves errno to a failure that passes.
class mark final {
 public:
  explicit mark(const char* link) noexcept : path(link) { static_cast<void>(::symlink(".", path)); }
  ~mark() {
    const int error = errno;
    ::unlink(path);
    errno = error;
  }
  mark(const mark&) = delete;
  mark& operator=(const mark&) = delete;

 private:
  const char* const path;
};

}  // namespace fs

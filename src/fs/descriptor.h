#pragma once

#include <unistd.h>

#include <cerrno>

namespace fs {

/// A file descriptor that closes itself at the end of its scope. Closing leaves errno as it was,
/// so that a failure on its way to a handler keeps its number.
class descriptor {
 public:
  /// Takes over what open(2) returned: a descriptor, or -1 where it failed.
  explicit descriptor(int opened) noexcept : number(opened) {}
  ~descriptor() {
    const int saved_errno = errno;
    if (is_open()) ::close(number);
    errno = saved_errno;
  }
  descriptor(const descriptor&) = delete;
  descriptor& operator=(const descriptor&) = delete;

  [[nodiscard]] bool is_open() const noexcept { return number >= 0; }
  [[nodiscard]] int get() const noexcept { return number; }

 private:
  int number;
};

}  // namespace fs

#pragma once

#include <unistd.h>

namespace fs {

/// A file descriptor that closes itself at the end of its scope.
class descriptor {
 public:
  /// Takes over what open(2) returned: a descriptor, or -1 where it failed.
  explicit descriptor(int opened) noexcept : number(opened) {}
  ~descriptor() {
    if (is_open()) ::close(number);
  }
  descriptor(const descriptor&) = delete;
  descriptor& operator=(const descriptor&) = delete;

  [[nodiscard]] bool is_open() const noexcept { return number >= 0; }
  [[nodiscard]] int get() const noexcept { return number; }

 private:
  int number;
};

}  // namespace fs

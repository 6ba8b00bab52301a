#pragma once

#include <sys/uio.h>

#include <array>
#include <cstddef>
#include <string_view>

namespace fs {

/// Up to nine texts that are written one after the other in a single call, whatever their size,
/// without a copy and without an allocation. The texts must outlive it.
class gathered_text {
 public:
  void append(std::string_view text) noexcept {
    // writev(2) only reads, but its structure has no const form.
    pieces[count++] = {const_cast<char*>(text.data()), text.size()};
  }

  /// Writes all of it to an open descriptor. A failure is ignored, but changes errno.
  void write_to(int descriptor) const noexcept {
    [[maybe_unused]] const ssize_t ignored =
        ::writev(descriptor, pieces.data(), static_cast<int>(count));
  }

 private:
  std::array<iovec, 9> pieces{};
  std::size_t count = 0;
};

}  // namespace fs

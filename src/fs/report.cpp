#include "fs/report.h"

#include <sys/uio.h>
#include <unistd.h>

#include <array>
#include <cerrno>
#include <cstddef>
#include <cstring>

namespace fs {

void report(int error, std::string_view format, std::initializer_list<const char*> texts) noexcept {
  const int saved_errno = errno;
  std::array<iovec, 9> pieces;
  int count = 0;
  const auto append = [&pieces, &count](std::string_view text) {
    // writev(2) only reads, but its structure has no const form.
    pieces[static_cast<std::size_t>(count++)] = {const_cast<char*>(text.data()), text.size()};
  };

  append("kestrel: ");
  for (const char* const text : texts) {
    const std::size_t place = format.find("%s");
    append(format.substr(0, place));
    append(text);
    format.remove_prefix(place + 2);
  }
  append(format);
  append(": ");
  append(std::strerror(error));
  append("\n");
  [[maybe_unused]] const ssize_t ignored = ::writev(STDERR_FILENO, pieces.data(), count);
  errno = saved_errno;
}

}  // namespace fs

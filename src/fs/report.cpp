#include "fs/report.h"

#include <unistd.h>

#include <cerrno>
#include <cstddef>
#include <cstring>

#include "fs/gathered_text.h"

namespace fs {

void report(int error, std::string_view format, std::initializer_list<const char*> texts) noexcept {
  const int saved_errno = errno;
  gathered_text line;
  line.append("kestrel: ");
  for (const char* const text : texts) {
    const std::size_t place = format.find("%s");
    line.append(format.substr(0, place));
    line.append(text);
    format.remove_prefix(place + 2);
  }
  line.append(format);
  line.append(": ");
  line.append(std::strerror(error));
  line.append("\n");
  line.write_to(STDERR_FILENO);
  errno = saved_errno;
}

}  // namespace fs

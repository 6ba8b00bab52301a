#include "ctl/reports.h"

#include <cerrno>
#include <cstring>
#include <new>

#include "fs/report.h"

namespace {

faults& kept() {
  static faults lines;
  return lines;
}

}  // namespace

faults reports() {
  return kept();
}

void forget_reports() {
  kept().clear();
}

namespace fs {

void report(int error, std::string_view format, std::initializer_list<const char*> texts) noexcept {
  if (error == 0) return;
  const int saved_errno = errno;
  try {
    const std::vector<std::string> copies(texts.begin(), texts.end());
    kept().emplace_back(filled(format, copies), std::initializer_list<std::string>{},
                        std::strerror(error));
  } catch (const std::bad_alloc&) {
    // The exception that follows the line says that something failed.
  }
  errno = saved_errno;
}

}  // namespace fs

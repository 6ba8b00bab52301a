#include "ctl/withdrawn.h"

#include <fcntl.h>
#include <unistd.h>

#include <sstream>

#include "ctl/files.h"
#include "ctl/workplace.h"
#include "fs/descriptor.h"
#include "paths.h"

std::optional<version_set> read_withdrawn() {
  try {
    const std::optional<std::string> content = read_file(withdrawn_list);
    if (!content && is_there(withdrawn_list)) return {};
    std::istringstream lines(content.value_or(""));
    version_set versions;
    for (std::string version; lines >> version;) versions.insert(version);
    return versions;
  } catch (const std::system_error&) {
    return {};
  }
}

void write_withdrawn(const version_set& versions) {
  if (versions.empty()) {
    check(::unlink(withdrawn_list) == 0, withdrawn_list);
    return;
  }
  std::string lines;
  for (const std::string& version : versions) lines += version + "\n";
  const fs::descriptor file(
      ::open(new_withdrawn_list, O_WRONLY | O_CREAT | O_EXCL | O_CLOEXEC, 0644));
  check(file.is_open(), new_withdrawn_list);
  try {
    const ssize_t written = ::write(file.get(), lines.data(), lines.size());
    check(written == static_cast<ssize_t>(lines.size()) && ::fsync(file.get()) == 0,
          new_withdrawn_list);
    check(::rename(new_withdrawn_list, withdrawn_list) == 0, withdrawn_list);
  } catch (...) {
    static_cast<void>(::unlink(new_withdrawn_list));
    throw;
  }
  sync_file_system(paths::storage);
}

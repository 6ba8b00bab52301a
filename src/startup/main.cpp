#include <unistd.h>

#include <cerrno>
#include <csignal>
#include <exception>

#include "fs/report.h"
#include "startup/dataset_links.h"
#include "startup/localtime.h"
#include "startup/select_dataset.h"
#include "startup/storage.h"

namespace {

/// Runs one stage. What it throws has been reported, and must not stop the later stages.
void attempt(void (*stage)()) noexcept {
  try {
    stage();
  } catch (...) {
  }
}

void select_dataset_or_reset() {
  try {
    select_dataset();
  } catch (...) {
    fs::report(errno, "Unable to locate data; resetting to system partition");
    reset_to_system();
  }
}

}  // namespace

int main(int /*count*/, char** /*arguments*/) {
  // A closed pipe and a file-size limit are then ordinary failed writes.
  static_cast<void>(std::signal(SIGPIPE, SIG_IGN));
  static_cast<void>(std::signal(SIGXFSZ, SIG_IGN));
  // Called where there is no memory even for an exception.
  std::set_terminate([] { ::_exit(0); });

  attempt(prepare_storage);
  attempt(migrate_legacy_icutz);
  attempt(remove_legacy_icu);
  attempt(select_dataset_or_reset);
  attempt(repair_localtime_link);
  return 0;
}

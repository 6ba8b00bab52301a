#include "startup/localtime.h"
#include "startup/storage.h"

namespace {

/// Runs one stage. Nothing that leaves it ends the run: it has been reported where it arose, there
/// is no further fallback, and the stages behind it still do their work.
void attempt(void (*stage)()) noexcept {
  try {
    stage();
  } catch (...) {
  }
}

}  // namespace

int main(int /*count*/, char** /*arguments*/) {
  attempt(prepare_storage);
  attempt(migrate_legacy_icutz);
  attempt(remove_legacy_icu);
  attempt(repair_localtime_link);
  return 0;
}

#include "startup/localtime.h"

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
  attempt(repair_localtime_link);
  return 0;
}

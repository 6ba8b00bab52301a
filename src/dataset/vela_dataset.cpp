#include "dataset/vela_dataset.h"

#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <stdexcept>
#include <string_view>
#include <utility>

#include "dataset/vela_icu.h"
#include "dataset/vela_zoneinfo.h"
#include "fs/report.h"
#include "paths.h"

namespace {

/// The mark of an activation, for the length of a scope: a link to ".", so that `fs::exists` sees
/// it. One that stands already is taken over; where none can be made, the scope goes on without.
class mark final {
 public:
  mark() noexcept { [[maybe_unused]] const int ignored = ::symlink(".", paths::switching_mark); }
  ~mark() {
    const int error = errno;  // that of a failure on its way to a handler
    ::unlink(paths::switching_mark);
    errno = error;
  }
  mark(const mark&) = delete;
  mark& operator=(const mark&) = delete;
};

}  // namespace

vela_dataset::vela_dataset(std::string dataset_path) : path(std::move(dataset_path)) {
  create_components();
}

void vela_dataset::create_components() {
  constexpr std::string_view downloads = paths::downloads;
  const std::shared_ptr<vela_zoneinfo> zoneinfo(new vela_zoneinfo(path));
  if (path.empty()) {
    version_string = zoneinfo->get_version_text() + ".1.0";
  } else if (path.size() > downloads.size() && path.starts_with(downloads)) {
    version_string = path.substr(downloads.size());
  } else {
    errno = 0;
    fs::report(errno, "vela_dataset::create_components: bad path %s", {path.c_str()});
    throw std::invalid_argument("badpath");
  }
  version.parse(version_string);
  components = {zoneinfo, std::shared_ptr<vela_dataset_component>(new vela_icu(path))};
}

bool vela_dataset::compatible_schema(const vela_dataset& other) const {
  return std::ranges::equal(components, other.components, [](const auto& mine, const auto& theirs) {
    return mine->compatible_schema(*theirs);
  });
}

void vela_dataset::activate() const {
  const mark switching;
  for (const auto& component : components) component->activate();
}

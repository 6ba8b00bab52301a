#include "ctl/completeness.h"

#include <sys/stat.h>

#include <cctype>
#include <cerrno>
#include <filesystem>
#include <optional>
#include <sstream>

#include "ctl/bundle.h"
#include "ctl/files.h"
#include "ctl/tzif.h"
#include "dataset/vela_icu.h"
#include "dataset/vela_zoneinfo.h"
#include "paths.h"

namespace {

/// A copy on the way to its faults.
struct inspection {
  std::filesystem::path top;    // the directory of the download; for the system copy, its tree
  std::filesystem::path tree;   // the zoneinfo tree, relative to `top`
  std::filesystem::path shown;  // how the lines call `top`
  std::string schema;           // the system copy's
  faults found = {};

  [[nodiscard]] std::string name_of(const std::filesystem::path& inside) const {
    return inside.empty() ? shown : shown / inside;
  }
};

std::filesystem::recursive_directory_iterator everything_in(const std::filesystem::path& top) {
  return {top, std::filesystem::directory_options::skip_permission_denied};
}

bool is_open_to_all(const std::filesystem::file_status& status) {
  const std::filesystem::perms needed{is_directory(status) ? 0555U : 0444U};
  return (status.permissions() & needed) == needed;
}

fault leads_out(const std::string& path) {
  return fault("%s is a link that leads out of the copy or nowhere", {path});
}

fault not_whole(const std::string& path) {
  return fault("%s is not whole", {path});
}

/// The names of zones begin with capital letters, those of tables do not.
bool has_zone_name(const std::filesystem::path& entry) {
  return std::isupper(static_cast<unsigned char>(entry.filename().string().front())) != 0;
}

bool is_zone_or_table(const std::string& content, bool is_zone) {
  if (is_zone || content.starts_with("TZif")) return is_whole_zone(content);
  return !content.empty() && content.find('\0') == std::string::npos;
}

/// The image's link to the local zone, by which TZ=localtime works.
constexpr const char* local_zone = "/etc/localtime";

/// Where an entry of a copy leads; nothing where that is out of the copy, or nowhere. What an
/// absolute link leads to that the system copy has too, its `twin`, is the image's own.
std::optional<std::filesystem::path> end_of(const std::filesystem::path& top,
                                            const std::filesystem::path& inside,
                                            const std::filesystem::path& twin) {
  const std::string target = link_target(top / inside);
  if (target.starts_with('/') && target == link_target(twin)) return top / inside;
  return resolve_inside(top, inside);
}

/// Where a link leads, a zone, a table or a directory has to be, inside of the tree, where it is
/// looked at itself. Only what an image's own link leads to is read here.
void inspect_link(inspection& copy, const std::filesystem::path& name) {
  const std::filesystem::path tree = copy.top / copy.tree;
  const std::filesystem::path inside = copy.tree / name;
  if (name == "localtime" && link_target(tree / name) == local_zone) return;
  const auto end = end_of(tree, name, paths::system_zoneinfo / name);
  const auto is_good_file = [&] {
    return *end == tree / name ? is_zone_or_table(read_file(*end).value_or(""), has_zone_name(name))
                               : has_zone_name(*end) || !has_zone_name(name);
  };
  if (!end) {
    copy.found.push_back(leads_out(copy.name_of(inside)));
  } else if (const std::string closed = closed_part(*end); !closed.empty()) {
    copy.found.push_back(closed_to_some(closed));
  } else if (!leads_to_directory(*end) && !is_good_file()) {
    copy.found.push_back(not_whole(copy.name_of(inside)));
  }
}

/// Whether the directory `name` of the copy is one, inside of it, so that it can be looked at.
bool inspect_top(inspection& copy, const std::filesystem::path& name) {
  if (!leads_to_directory(copy.top / name)) {
    copy.found.push_back(fault("%s is missing or no directory", {copy.name_of(name)}));
  } else if (!resolve_inside(copy.top, name)) {
    copy.found.push_back(leads_out(copy.name_of(name)));
  } else if (const std::string closed = closed_part(copy.top / name); !closed.empty()) {
    copy.found.push_back(closed_to_some(closed));
  } else {
    return true;
  }
  return false;
}

void inspect_tree(inspection& copy) {
  const std::filesystem::path tree = copy.top / copy.tree;
  auto entry = everything_in(tree);
  for (; entry != std::filesystem::recursive_directory_iterator(); ++entry) {
    const std::filesystem::path name = entry->path().lexically_relative(tree);
    const std::filesystem::path inside = copy.tree / name;
    const std::filesystem::file_status status = entry->symlink_status();
    if (is_symlink(status)) {
      inspect_link(copy, name);
    } else if (!is_directory(status) && !is_regular_file(status)) {
      copy.found.push_back(
          fault("%s is neither a file, nor a directory, nor a link", {copy.name_of(inside)}));
    } else if (!is_open_to_all(status)) {
      copy.found.push_back(closed_to_some(copy.name_of(inside)));
      entry.disable_recursion_pending();
    } else if (is_regular_file(status) &&
               !is_zone_or_table(read_file(entry->path()).value_or(""), has_zone_name(name))) {
      copy.found.push_back(not_whole(copy.name_of(inside)));
    }
  }
}

/// Whether the copy has what the system copy has as `theirs`, a file or a directory.
bool inspect_counterpart(inspection& copy, const std::filesystem::path& theirs,
                         const std::filesystem::path& inside) {
  const std::filesystem::path ours = copy.top / inside;
  struct stat found {};
  const bool is_found = ::stat(ours.c_str(), &found) == 0;
  check(is_found || !is_hard(errno), ours);
  const bool is_good = is_found && leads_to_directory(ours) == leads_to_directory(theirs);
  // What is closed, and a link that leads nowhere, has its fault already.
  const bool is_told = !is_found && (errno == EACCES || is_there(ours));
  if (!is_good && !is_told) copy.found.push_back(fault("%s is missing", {copy.name_of(inside)}));
  return is_good;
}

/// What the system copy has; links that lead out of it are the image's own.
void inspect_missing(inspection& copy) {
  const std::filesystem::path system = paths::system_zoneinfo;
  if (!leads_to_directory(system)) return;
  auto theirs = everything_in(system);
  for (; theirs != std::filesystem::recursive_directory_iterator(); ++theirs) {
    const std::filesystem::path name = theirs->path().lexically_relative(system);
    if (!resolve_inside(system, name)) continue;
    if (!inspect_counterpart(copy, theirs->path(), copy.tree / name))
      theirs.disable_recursion_pending();
  }
}

/// The files of the tree that name a release have to name that of the version.
void inspect_release(inspection& copy, const std::string& version) {
  constexpr std::string_view head = "# version ";
  const std::string release = release_of(version);
  const auto compare = [&](const char* name, const std::string& found) {
    if (found != release) {
      copy.found.push_back(
          fault("%s is of release %s, not %s", {copy.name_of(copy.tree / name), found, release}));
    }
  };
  const std::filesystem::path tree = copy.top / copy.tree;
  const std::string file = tree / "+VERSION";
  if (is_there(file)) {
    std::string word;
    std::istringstream(read_file(file).value_or("")) >> word;
    compare("+VERSION", word);
  } else {
    copy.found.push_back(fault("%s is missing", {copy.name_of(copy.tree / "+VERSION")}));
  }
  if (const auto source = read_file(tree / "tzdata.zi"); source && source->starts_with(head))
    compare("tzdata.zi", source->substr(head.size(), source->find('\n') - head.size()));
}

void inspect_schema(inspection& copy) {
  const std::string declared = schema_of(copy.top);
  const std::string file = "icutz/icutz" + copy.schema + ".dat";
  if (declared.empty()) {
    copy.found.push_back(fault("%s is missing or no file", {copy.name_of(file)}));
  } else if (declared != copy.schema) {
    copy.found.push_back(fault("%s has schema %s, and the system copy has %s",
                               {copy.name_of("icutz"), declared, copy.schema}));
  }
}

/// Whether everyone can read what is in the directory, and no link leads out of it.
bool inspect_bundle_directory(inspection& copy) {
  const std::size_t before = copy.found.size();
  auto entry = everything_in(copy.top / "icutz");
  for (; entry != std::filesystem::recursive_directory_iterator(); ++entry) {
    const std::filesystem::path inside = entry->path().lexically_relative(copy.top);
    const auto end = resolve_inside(copy.top, inside);
    if (!end) {
      copy.found.push_back(leads_out(copy.name_of(inside)));
    } else if (entry.depth() == 0) {  // ICU reads nothing below
      const std::string closed = closed_part(*end);
      if (!closed.empty()) copy.found.push_back(closed_to_some(closed));
    }
  }
  return copy.found.size() == before;
}

void inspect_bundles(inspection& copy) {
  // Without a schema, the system copy is at fault, which is told elsewhere.
  if (!inspect_top(copy, "icutz") || !inspect_bundle_directory(copy) || copy.schema.empty()) return;
  inspect_schema(copy);
  for (const std::string name : {"zoneinfo64", "metaZones", "timezoneTypes", "windowsZones"}) {
    const std::filesystem::path inside = "icutz/" + name + ".res";
    const std::string content = read_file(copy.top / inside).value_or("");
    if (!is_there(copy.top / inside)) {
      copy.found.push_back(fault("%s is missing", {copy.name_of(inside)}));
    } else if (!is_whole_bundle(content)) {
      copy.found.push_back(not_whole(copy.name_of(inside)));
    } else if (!has_byte_order_of(copy.schema, content)) {
      copy.found.push_back(
          fault("%s has not the byte order of schema %s", {copy.name_of(inside), copy.schema}));
    }
  }
}

}  // namespace

faults faults_of_copy(const std::string& path, const std::string& version,
                      const std::string& shown) {
  inspection copy{path, "zoneinfo", shown, schema_of("")};
  if (path.empty()) copy = {paths::system_zoneinfo, "", paths::system_zoneinfo, copy.schema};
  if (inspect_top(copy, copy.tree)) {
    inspect_tree(copy);
    inspect_missing(copy);
    inspect_release(copy, version);
  }
  if (!path.empty()) inspect_bundles(copy);
  return copy.found;
}

std::string schema_of(const std::string& path) {
  return read_or_throw(path, [&path] { return vela_icu(path).get_schema(); });
}

bool has_zone(const std::string& path, const std::string& name) {
  const std::filesystem::path tree = zoneinfo_directory(path);
  const bool is_plain = std::filesystem::path(name).lexically_normal().string() == name;
  if (!is_plain || name.starts_with('/') || link_target(tree / name) == local_zone) return false;
  const auto file = end_of(tree, name, paths::system_zoneinfo / std::filesystem::path(name));
  return file && is_whole_zone(read_file(*file).value_or(""));
}

std::string release_of(const std::string& version) {
  return version.substr(0, version.find('.'));
}

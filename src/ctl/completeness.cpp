#include "ctl/completeness.h"

#include <filesystem>
#include <optional>
#include <system_error>

#include "ctl/bundle.h"
#include "ctl/files.h"
#include "ctl/tzif.h"
#include "dataset/vela_icu.h"
#include "dataset/vela_zoneinfo.h"
#include "fs/file.h"
#include "paths.h"

namespace {

using std::filesystem::directory_entry;

/// A copy on the way to its faults.
struct inspection {
  std::filesystem::path top;    // the directory of the download; for the system copy, its tree
  std::filesystem::path tree;   // the zoneinfo tree, relative to `top`
  std::filesystem::path shown;  // how the lines call `top`
  std::string schema;           // the system copy's
  faults found = {};

  [[nodiscard]] std::string name_of(const std::filesystem::path& inside) const {
    return shown / inside;
  }
};

/// Calls `look(entry, its path relative to top)` for all that is below a directory of the copy;
/// `look` gives false where it is not to go into that directory.
template <typename Look>
void walk(const std::filesystem::path& top, const std::filesystem::path& below, Look look) {
  std::error_code error;
  const auto options = std::filesystem::directory_options::skip_permission_denied;
  std::filesystem::recursive_directory_iterator entry(top / below, options, error);
  for (const std::filesystem::recursive_directory_iterator end; !error && entry != end;
       entry.increment(error))
    if (!look(*entry, entry->path().lexically_relative(top))) entry.disable_recursion_pending();
}

bool is_open_to_all(const std::filesystem::file_status& status) {
  using std::filesystem::perms;
  const perms needed =
      is_directory(status) ? perms::others_read | perms::others_exec : perms::others_read;
  return (status.permissions() & needed) == needed;
}

fault closed_to_some(const std::string& path, bool is_directory) {
  return fault("not everyone can read %s", {path}, is_directory ? "chmod 755 it" : "chmod 644 it");
}

bool is_zone_or_text(const std::string& content, const std::filesystem::path& twin) {
  if (content.starts_with("TZif")) return is_whole_zone(content);
  const bool is_text = !content.empty() && content.find('\0') == std::string::npos;
  return is_text && !read_file(twin).value_or("").starts_with("TZif");
}

void inspect_link(inspection& copy, const std::filesystem::path& inside,
                  const std::filesystem::path& twin) {
  const std::string target = link_target(copy.top / inside);
  const bool is_of_the_image = target.starts_with('/') && target == link_target(twin);
  if (!is_of_the_image && !resolve_inside(copy.top, inside)) {
    copy.found.push_back(
        fault("%s is a link that leads out of the copy or nowhere", {copy.name_of(inside)}));
  }
}

void inspect_tree(inspection& copy) {
  const std::filesystem::path system = paths::system_zoneinfo;
  std::error_code error;
  if (!std::filesystem::is_directory(copy.top / copy.tree, error))
    copy.found.push_back(fault("%s is missing or no directory", {copy.name_of(copy.tree)}));
  walk(copy.top, copy.tree, [&](const directory_entry& entry, const auto& inside) {
    const std::filesystem::path twin = system / inside.lexically_relative(copy.tree);
    const std::filesystem::file_status status = entry.symlink_status(error);
    if (is_symlink(status)) {
      inspect_link(copy, inside, twin);
    } else if (!is_directory(status) && !is_regular_file(status)) {
      copy.found.push_back(
          fault("%s is neither a file, nor a directory, nor a link", {copy.name_of(inside)}));
    } else if (!is_open_to_all(status)) {
      copy.found.push_back(closed_to_some(copy.name_of(inside), is_directory(status)));
    } else if (is_regular_file(status) &&
               !is_zone_or_text(read_file(entry.path()).value_or(""), twin)) {
      copy.found.push_back(fault("%s is not whole", {copy.name_of(inside)}));
    }
    return true;
  });
}

/// What the system copy has; links that lead out of it are the image's own.
void inspect_missing(inspection& copy) {
  const std::filesystem::path system = paths::system_zoneinfo;
  walk(system, "", [&](const directory_entry& theirs, const auto& name) {
    std::error_code error;
    const std::filesystem::path ours = copy.top / copy.tree / name;
    const bool is_wanted = !theirs.is_symlink(error) || resolve_inside(system, name);
    if (!is_wanted || std::filesystem::is_symlink(ours, error)) return true;
    const bool is_directory = theirs.is_directory(error);
    if (std::filesystem::exists(ours, error) &&
        std::filesystem::is_directory(ours, error) == is_directory)
      return true;
    copy.found.push_back(fault("%s is missing", {copy.name_of(copy.tree / name)}));
    return false;
  });
}

/// Where a file of the tree names its release, it has to be that of the version.
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
  const std::string word = fs::read_first_word((tree / "+VERSION").c_str());
  if (!word.empty()) compare("+VERSION", word);
  if (const auto source = read_file(tree / "tzdata.zi"); source && source->starts_with(head))
    compare("tzdata.zi", source->substr(head.size(), source->find('\n') - head.size()));
}

void inspect_schema(inspection& copy) {
  const std::string declared = vela_icu(copy.top).get_schema();
  const std::string file = "icutz" + copy.schema + ".dat";
  if (declared.empty()) {
    copy.found.push_back(fault("%s is missing", {copy.name_of("icutz/" + file)}));
  } else if (declared != copy.schema) {
    copy.found.push_back(fault("%s has schema %s, and the system copy has %s",
                               {copy.name_of("icutz"), declared, copy.schema}));
  }
}

void inspect_bundles(inspection& copy) {
  bool is_closed = false;
  walk(copy.top, "icutz", [&](const directory_entry& entry, const auto& inside) {
    std::error_code error;
    const std::filesystem::file_status status = entry.symlink_status(error);
    if (is_symlink(status)) {
      if (!resolve_inside(copy.top, inside)) {
        copy.found.push_back(
            fault("%s is a link that leads out of the copy or nowhere", {copy.name_of(inside)}));
      }
    } else if (!is_open_to_all(status)) {
      copy.found.push_back(closed_to_some(copy.name_of(inside), is_directory(status)));
      is_closed = true;
    }
    return false;
  });
  if (!is_closed) inspect_schema(copy);
  for (const std::string name : {"zoneinfo64", "metaZones", "timezoneTypes", "windowsZones"}) {
    const std::filesystem::path inside = "icutz/" + name + ".res";
    const std::optional<std::string> content = read_file(copy.top / inside);
    if (!content) {
      copy.found.push_back(fault("%s is missing", {copy.name_of(inside)}));
    } else if (!is_whole_bundle(*content)) {
      copy.found.push_back(fault("%s is not whole", {copy.name_of(inside)}));
    } else if (!copy.schema.empty() && !has_byte_order_of(copy.schema, *content)) {
      copy.found.push_back(
          fault("%s has not the byte order of schema %s", {copy.name_of(inside), copy.schema}));
    }
  }
}

}  // namespace

faults faults_of_copy(const std::string& path, const std::string& version,
                      const std::string& shown) {
  inspection copy{path, "zoneinfo", shown, vela_icu().get_schema()};
  if (path.empty()) {
    copy = {paths::system_zoneinfo, "", paths::system_zoneinfo, copy.schema};
    inspect_tree(copy);
  } else {
    inspect_tree(copy);
    inspect_missing(copy);
    inspect_bundles(copy);
  }
  inspect_release(copy, version);
  return copy.found;
}

bool has_zone(const std::string& path, const std::string& name) {
  const auto file = resolve_inside(zoneinfo_directory(path), name);
  const bool is_plain = std::filesystem::path(name).lexically_normal() == name;
  return file && is_plain && is_whole_zone(read_file(*file).value_or(""));
}

std::string release_of(const std::string& version) {
  return version.substr(0, version.find('.'));
}

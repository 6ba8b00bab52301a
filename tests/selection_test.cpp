#include "world.h"

namespace {

const std::string base = system_copy("2022b", "44l") + "localtime>~/zoneinfo/Asia/Tokyo ";
const std::string base_c = system_copy("2022c", "44l") + "localtime>~/zoneinfo/Asia/Tokyo ";

std::string current(const std::string& version) {
  return "zoneinfo>~/tz/" + version + "/zoneinfo icutz>~/tz/" + version + "/icutz ";
}
std::string latest(const std::string& version) {
  return "tz_latest>~/tz/" + version + " ";
}
std::string record(const std::string& text) {
  return "TZVersionDiffRecord=" + text + " ";
}

const std::string to_system = "zoneinfo>/usr/share/zoneinfo.default ";
const std::string incompatible =
    "Symlink points at data incompatible with installed system: Success";

std::string invalid(const std::string& error) {
  return "Invalid current symlinks; resetting to system partition: " + error;
}
std::string unable(const std::string& error) {
  return "Unable to locate data; resetting to system partition: " + error;
}
std::string not_newer(const std::string& texts) {
  return "New update not compatible or older version: " + texts + ": Success";
}
std::string create_failed(const std::string& link, const std::string& target) {
  return "create_symlink: from /var/db/timezone/" + link + " to " + target + ": File exists";
}

const std::string b1 = download("2022b.1.0", "44l");
const std::string b2 = download("2022b.2.0", "44l");
const std::string a1 = download("2022a.1.0", "44l");
const std::string other_schema = download("2022d.1.0", "45l");
const std::string no_link = "Bad zoneinfo link : No such file or directory";
const std::string missing = "No such file or directory";

const std::vector<scene> decisions = {
    {"kept", base + b1 + current("2022b.1.0"), {}, ""},
    {"kept_then_switched",
     base + b1 + b2 + current("2022b.1.0") + latest("2022b.2.0") + record("x"),
     {},
     current("2022b.2.0") + record("2022b.1.0_2022b.2.0")},
    {"steady",
     base + b2 + current("2022b.2.0") + latest("2022b.2.0") + record("x"),
     {not_newer("2022b.2.0 vs. 2022b.2.0")},
     ""},
    {"download_of_another_schema",
     base + b1 + other_schema + current("2022b.1.0") + latest("2022d.1.0"),
     {not_newer("2022d.1.0 vs. 2022b.1.0")},
     ""},
    {"older_than_system",
     base_c + b2 + current("2022b.2.0") + record("x"),
     {incompatible},
     to_system + "-icutz"},
    {"another_schema_than_system",
     base + other_schema + current("2022d.1.0"),
     {incompatible},
     to_system + "-icutz"},
    {"older_then_newer",
     base + a1 + b2 + current("2022a.1.0") + latest("2022b.2.0"),
     {incompatible},
     current("2022b.2.0") + record("2022b.1.0_2022b.2.0")},
    {"older_then_less_old",
     base_c + a1 + b2 + current("2022a.1.0") + latest("2022b.2.0"),
     {incompatible},
     current("2022b.2.0") + record("2022c.1.0_2022b.2.0")},
    {"older_and_no_newer",
     base_c + b2 + current("2022b.2.0") + latest("2022b.2.0"),
     {incompatible, not_newer("2022b.2.0 vs. 2022b.2.0")},
     to_system + "-icutz"},
    {"no_link", base, {no_link, invalid(missing)}, to_system},
    {"no_link_then_newer",
     base + b2 + latest("2022b.2.0"),
     {no_link, invalid(missing)},
     current("2022b.2.0") + record("2022b.1.0_2022b.2.0")},
    {"no_link_and_no_newer",
     base + b1 + latest("2022b.1.0") + record("x"),
     {no_link, invalid(missing), not_newer("2022b.1.0 vs. 2022b.1.0")},
     to_system},
    {"bad_link",
     base + "zoneinfo>/usr/share/zoneinfo icutz>/usr /var/db/icutz>/usr",
     {"Bad zoneinfo link /usr/share/zoneinfo: Success", invalid("Success")},
     to_system + "-icutz -/var/db/icutz"},
    {"link_is_a_file",
     base + "zoneinfo=x",
     {"read_symlink: /var/db/timezone/zoneinfo: Invalid argument", invalid("Invalid argument")},
     to_system},
};

const std::vector<scene> failures = {
    {"latest_is_a_file",
     base + b1 + current("2022b.1.0") + "tz_latest=",
     {"read_symlink: /var/db/timezone/tz_latest: Invalid argument", unable("Invalid argument")},
     to_system + "-icutz"},
    {"latest_is_relative",
     base + "tz_latest>tz/2022b.2.0",
     {no_link, invalid(missing), "vela_dataset::create_components: bad path tz/2022b.2.0: Success",
      unable("Success")},
     to_system},
    {"number_too_large",
     base + "zoneinfo>~/tz/2147483648a/zoneinfo",
     {unable("Numerical result out of range")},
     to_system},
    {"current_is_gone",
     base + current("2022b.1.0"),
     {"No ICU schema found for /var/db/timezone/tz/2022b.1.0: Success", incompatible},
     to_system + "-icutz"},
    {"data_file_unfit",
     base + b1 + latest("2022b.2.0") +
         "tz/2022b.2.0/icutz/icutz44l.dat= "
         "tz/2022b.2.0/icutz/icutz44l.dat%640 tz/2022b.2.0/icutz/icutz44b.dat>icutz44l.dat "
         "tz/2022b.2.0/icutz/below/icutz44l.dat= " +
         to_system,
     {"No ICU schema found for /var/db/timezone/tz/2022b.2.0: Success",
      not_newer("2022b.2.0 vs. 2022b.1.0")},
     ""},
    {"system_without_files",
     b1 + current("2022b.1.0") + "localtime>~/zoneinfo/Asia/Tokyo ",
     {"Cannot parse version string .1.0, results.size() = 0: Success",
      "Cannot parse version string .1.0: Success", incompatible,
      "Cannot parse version string .1.0, results.size() = 0: Success",
      "Cannot parse version string .1.0: Success"},
     to_system + "-icutz"},
    {"version_is_a_fifo",
     base +
         "tz/2022b.2.0/zoneinfo/+VERSION| "
         "tz/2022b.2.0/icutz/icutz44l.dat= TZVersionDiffRecord| " +
         to_system + latest("2022b.2.0"),
     {},
     current("2022b.2.0")},
    {"zoneinfo_is_a_directory",
     base + "zoneinfo/Asia/Tokyo=",
     {"read_symlink: /var/db/timezone/zoneinfo: Invalid argument", invalid("Invalid argument"),
      "remove: could not remove /var/db/timezone/zoneinfo: Is a directory",
      "Unlink of zoneinfo softlink failed: Is a directory",
      create_failed("zoneinfo", "/usr/share/zoneinfo.default"), unable("File exists"),
      "remove: could not remove /var/db/timezone/zoneinfo: Is a directory",
      "Unlink of zoneinfo softlink failed: Is a directory",
      create_failed("zoneinfo", "/usr/share/zoneinfo.default")},
     ""},
    {"icutz_is_a_directory",
     base + b2 + to_system + latest("2022b.2.0") +
         "icutz/kept= "
         "/var/db/icutz>/missing " +
         record("x"),
     {"remove: could not remove /var/db/timezone/icutz: Is a directory",
      "unlink of ICU softlink failed: Is a directory",
      create_failed("icutz", "/var/db/timezone/tz/2022b.2.0/icutz"), unable("File exists"),
      "remove: could not remove /var/db/timezone/icutz: Is a directory",
      "unlink of ICU softlink failed: Is a directory"},
     to_system},
    {"record_is_a_directory",
     base + b2 + to_system + latest("2022b.2.0") + "TZVersionDiffRecord/",
     {},
     current("2022b.2.0")},
};

}  // namespace

INSTANTIATE_TEST_SUITE_P(Decisions, Run, testing::ValuesIn(decisions), scene_name);
INSTANTIATE_TEST_SUITE_P(Failures, Run, testing::ValuesIn(failures), scene_name);

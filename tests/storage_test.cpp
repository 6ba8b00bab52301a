#include "world.h"

namespace {

const std::string settled = system_copy("2022a", "44l") +
                            "zoneinfo>/usr/share/zoneinfo.default localtime>~/zoneinfo/Asia/Tokyo ";
const std::string could_not_migrate = "Could not migrate /var/db/icutz to /var/db/timezone/icutz: ";

const std::vector<scene> scenes = {
    {"nothing_left_behind", settled + "tz/", {}, ""},
    {"legacy_moves",
     settled + "/var/db/icutz>../share/icu /var/share/icu/",
     {},
     "-/var/db/icutz icutz>../share/icu"},
    {"both_keep_the_current",
     settled + "/var/db/icutz>/usr icutz>/usr/share",
     {},
     "-/var/db/icutz"},
    {"dangling_legacy_stays", settled + "/var/db/icutz>/missing", {}, ""},
    {"dangling_current_is_in_the_way",
     settled + "/var/db/icutz>/usr icutz>/missing",
     {"create_symlink: from /var/db/timezone/icutz to /usr: File exists",
      could_not_migrate + "File exists"},
     "-/var/db/icutz"},
    {"legacy_is_a_file",
     settled + "/var/db/icutz=",
     {"read_symlink: /var/db/icutz: Invalid argument", could_not_migrate + "Invalid argument"},
     "-/var/db/icutz"},
    {"legacy_is_a_directory",
     settled + "/var/db/icutz/kept=",
     {"read_symlink: /var/db/icutz: Invalid argument", could_not_migrate + "Invalid argument",
      "remove: could not remove /var/db/icutz: Is a directory",
      "Could not remove /var/db/icutz: Is a directory"},
     ""},
    {"no_storage",
     system_copy("2022a", "44l") + "/var/db/icutz>/usr",
     {"create_symlink: from /var/db/timezone/icutz to /usr: No such file or directory",
      could_not_migrate + "No such file or directory",
      "Bad zoneinfo link : No such file or directory",
      "Invalid current symlinks; resetting to system partition: No such file or directory",
      "create_symlink: from /var/db/timezone/zoneinfo to /usr/share/zoneinfo.default: "
      "No such file or directory",
      "Unable to locate data; resetting to system partition: No such file or directory",
      "create_symlink: from /var/db/timezone/zoneinfo to /usr/share/zoneinfo.default: "
      "No such file or directory",
      "localtime link invalid; resetting to America/Los_Angeles: No such file or directory",
      "create_symlink: from /var/db/timezone/localtime to "
      "/var/db/timezone/zoneinfo/America/Los_Angeles: No such file or directory"},
     "-/var/db/icutz"},
    {"icu_file", settled + "/var/db/icu=", {}, "-/var/db/icu"},
    {"icu_link", settled + "/var/db/icu>/usr", {}, "-/var/db/icu"},
    {"icu_empty_directory", settled + "/var/db/icu/", {}, "-/var/db/icu"},
    {"icu_full_directory", settled + "/var/db/icu/kept=", {}, ""},
};

}  // namespace

INSTANTIATE_TEST_SUITE_P(Storage, Run, testing::ValuesIn(scenes), scene_name);

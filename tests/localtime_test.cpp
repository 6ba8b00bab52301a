#include "world.h"

namespace {

const std::string settled = system_copy("2022a", "44l") + "zoneinfo>/usr/share/zoneinfo.default ";
const std::string default_link = "localtime>~/zoneinfo/America/Los_Angeles";

const std::vector<scene> scenes = {
    {"good", settled + "localtime>~/zoneinfo/Asia/Tokyo", {}, ""},
    {"good_but_dangling", settled + "localtime>~/zoneinfo/Europe/Paris", {}, ""},
    {"prefix_alone_counts", settled + "localtime>~/zoneinfo.else", {}, ""},
    {"legacy",
     settled + "localtime>/usr/share/zoneinfo/Asia/Tokyo",
     {"Correcting localtime link to /var/db/timezone/zoneinfo/Asia/Tokyo: Success"},
     "localtime>~/zoneinfo/Asia/Tokyo"},
    {"legacy_tree_itself",
     settled + "localtime>/usr/share/zoneinfo",
     {"Correcting localtime link to /var/db/timezone/zoneinfo: Success"},
     "localtime>~/zoneinfo"},
    {"legacy_without_the_zone",
     settled + "localtime>/usr/share/zoneinfo.default/Asia/Tokyo",
     {"Correcting localtime link to /var/db/timezone/zoneinfo.default/Asia/Tokyo: Success",
      "localtime link invalid; resetting to America/Los_Angeles: No such file or directory"},
     default_link},
    {"legacy_that_cannot_be_replaced",
     settled + "localtime>/usr/share/zoneinfo/Asia/Tokyo .%555",
     {"Correcting localtime link to /var/db/timezone/zoneinfo/Asia/Tokyo: Success",
      "create_symlink: from /var/db/timezone/localtime to "
      "/var/db/timezone/zoneinfo/Asia/Tokyo: File exists",
      "localtime link invalid; resetting to America/Los_Angeles: File exists",
      "create_symlink: from /var/db/timezone/localtime to "
      "/var/db/timezone/zoneinfo/America/Los_Angeles: File exists"},
     "",
     true},
    {"missing",
     settled,
     {"localtime link invalid; resetting to America/Los_Angeles: No such file or directory"},
     default_link},
    {"plain_file",
     settled + "localtime=TZif",
     {"read_symlink: /var/db/timezone/localtime: Invalid argument",
      "localtime link invalid; resetting to America/Los_Angeles: Invalid argument"},
     default_link},
    {"empty_directory",
     settled + "localtime/",
     {"read_symlink: /var/db/timezone/localtime: Invalid argument",
      "localtime link invalid; resetting to America/Los_Angeles: Invalid argument"},
     default_link},
    {"full_directory",
     settled + "localtime/kept=",
     {"read_symlink: /var/db/timezone/localtime: Invalid argument",
      "localtime link invalid; resetting to America/Los_Angeles: Invalid argument",
      "create_symlink: from /var/db/timezone/localtime to "
      "/var/db/timezone/zoneinfo/America/Los_Angeles: File exists"},
     ""},
    {"relative",
     settled + "localtime>zoneinfo/Asia/Tokyo",
     {"localtime link invalid; resetting to America/Los_Angeles: Success"},
     default_link},
    {"shorter_than_a_prefix",
     settled + "localtime>/usr/share/zoneinf",
     {"localtime link invalid; resetting to America/Los_Angeles: Success"},
     default_link},
};

}  // namespace

INSTANTIATE_TEST_SUITE_P(Localtime, Run, testing::ValuesIn(scenes), scene_name);

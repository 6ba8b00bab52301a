#include <sys/stat.h>

#include <cerrno>
#include <csignal>
#include <cstddef>
#include <functional>
#include <iostream>
#include <string>
#include <string_view>
#include <system_error>
#include <vector>

#include "ctl/commands.h"
#include "ctl/device.h"
#include "ctl/print.h"
#include "ctl/reports.h"
#include "ctl/workplace.h"

namespace {

using words = std::vector<std::string>;

/// A command. Its arguments are as many as the two numbers say. If the usage has a VERSION, that is
/// the first one.
struct command {
  const char* name;
  const char* usage;
  std::size_t least;
  std::size_t most;
  bool changes_storage;
  std::function<outcome(const words&)> run;
};

const std::vector<command>& commands() {
  static const std::vector<command> all = {
      {"status", "", 0, 0, false, [](const words&) { return print_status(); }},
      {"publish", " VERSION DIRECTORY", 2, 2, true,
       [](const words& arguments) { return publish(arguments[0], arguments[1]); }},
      {"back", " [VERSION]", 0, 1, true,
       [](const words& arguments) { return go_back(arguments.empty() ? "" : arguments[0]); }},
      {"prune", "", 0, 0, true, [](const words&) { return prune(); }},
      {"zone", " NAME", 1, 1, true, [](const words& arguments) { return set_zone(arguments[0]); }},
  };
  return all;
}

std::string usage() {
  std::string text;
  for (const command& each : commands())
    text += (text.empty() ? "usage: kestrelctl " : " | ") + (each.name + std::string(each.usage));
  return text;
}

/// The three steps before every change: whose rights, whether it is safe, who else is at work.
outcome change(const command& chosen, const words& arguments) {
  become_storage_owner();
  if (const faults found = faults_of_storage(); !found.empty())
    return refuse({outcome::failed, found});
  const storage_lock lock;
  if (!lock.is_held()) {
    return refuse({outcome::not_now,
                   {fault("another kestrelctl is at work", {}, "start again when it has ended")}});
  }
  if (clear_leftovers()) say(std::string("removed ") + workshop_path);
  return chosen.run(arguments);
}

outcome run_command(const command& chosen, const words& arguments) {
  if (arguments.size() < chosen.least || arguments.size() > chosen.most)
    return refuse({outcome::wrong_usage, {fault(usage())}});
  const bool takes_version = std::string_view(chosen.usage).find("VERSION") != std::string::npos;
  if (takes_version && !arguments.empty() && version_of(arguments[0]) == vela_version()) {
    return refuse({outcome::wrong_usage,
                   {fault("%s is no version", {arguments[0]}, "a version is such as 2026b.1.0")}});
  }
  if (chosen.changes_storage) return change(chosen, arguments);
  become_storage_owner();
  return chosen.run(arguments);
}

outcome run_line(const words& line) {
  const std::string name = line.empty() ? "" : line[0];
  for (const command& each : commands())
    if (name == each.name) return run_command(each, {line.begin() + 1, line.end()});
  if (line == words{"--version"}) {
    say("kestrelctl " KESTREL_VERSION);
  } else if (line == words{"--help"}) {
    say(usage());
  } else {
    return refuse({outcome::wrong_usage, {fault(usage())}});
  }
  return outcome::done;
}

/// What a command that was broken off leads to; `error` is the number of the failed call, or 0.
outcome explain(const faults& reasons, int error) {
  complain_all(reasons);
  if (error != ENOSPC && error != EDQUOT) return outcome::failed;
  complain(fault("there is no room", {}, "kestrelctl prune makes some"));
  return outcome::not_now;
}

outcome run_or_explain(const words& line) {
  try {
    return run_line(line);
  } catch (const std::system_error& failure) {
    return explain({fault(failure.what())}, failure.code().value());
  } catch (const std::exception& failure) {
    return explain({fault(failure.what())}, 0);
  } catch (int error) {
    return explain(reports(), error);
  }
}

}  // namespace

int main(int count, char** arguments) {
  // A closed pipe and a file-size limit are then ordinary failed writes.
  static_cast<void>(std::signal(SIGPIPE, SIG_IGN));
  static_cast<void>(std::signal(SIGXFSZ, SIG_IGN));
  ::umask(S_IWGRP | S_IWOTH);  // what is made is for everyone to read
  const outcome end = run_or_explain({arguments + 1, arguments + count});
  if (std::cout.flush()) return static_cast<int>(end);
  complain(fault("standard output cannot be written"));
  return static_cast<int>(outcome::failed);
}

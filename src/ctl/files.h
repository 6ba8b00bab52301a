#pragma once

#include <cerrno>
#include <filesystem>
#include <optional>
#include <string>

// Looking at files that anybody may have made. Nothing here waits or prints. All but `closed_part`
// throws std::system_error where the disk or the system fails, so that nobody takes what cannot be
// read for what is missing or bad.

/// Whether with this number it is the disk or the system that fails, and not the entry that is bad.
[[nodiscard]] bool is_hard(int error);

/// What `read` returns, a function of kestrel's, which takes for missing what it cannot read.
/// Throws std::system_error where the disk or the system has failed.
template <typename Read>
auto read_or_throw(const std::string& path, Read read);

/// Throws std::system_error with the number in errno and the path, where `done` is false.
void check(bool done, const std::string& path);

/// The content of the regular file at `path`, links followed. Nothing where it is missing or may
/// not be read, is a FIFO or a device, which is not opened, or has more than 2 MiB.
[[nodiscard]] std::optional<std::string> read_file(const std::string& path);

/// The content of the link at `path`; empty where there is none, or it cannot be read.
[[nodiscard]] std::string link_target(const std::string& path);

/// Whether an entry is at `path`, even a link that leads nowhere.
[[nodiscard]] bool is_there(const std::string& path);

/// Whether `path` is a directory, links followed.
[[nodiscard]] bool leads_to_directory(const std::string& path);

/// What not everyone can read: `path`, links followed, or the first directory on the way there that
/// not everyone can pass. Empty where everyone can read it, or nothing is there.
[[nodiscard]] std::string closed_part(const std::string& path);

/// Where `inside`, a path relative to the directory `top`, leads. Its links are followed one by
/// one, and none may leave `top`, not even to come back: then it leads to the same wherever `top`
/// is. Nothing where it leads out, nowhere, or round in a circle; where the caller cannot look, no
/// link is taken for one.
[[nodiscard]] std::optional<std::filesystem::path> resolve_inside(
    const std::filesystem::path& top, const std::filesystem::path& inside);

template <typename Read>
auto read_or_throw(const std::string& path, Read read) {
  errno = 0;
  auto result = read();
  check(!is_hard(errno), path);
  return result;
}

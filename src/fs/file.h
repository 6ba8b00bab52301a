#pragma once

#include <string>
#include <string_view>

/// Reading and writing small files. Both print and throw nothing.
namespace fs {

/// The first word of the file at `path`, links followed: the bytes (NULs included) between leading
/// white space of the C locale and the next white space or the end of the file. Empty when the file
/// is missing, blank, or cannot be read, or is a FIFO or a device, which is not opened. Also empty
/// when the word does not end within the file's first 64 MiB or the available memory: a sparse file
/// must not cost a boot.
[[nodiscard]] std::string read_first_word(const char* path) noexcept;

/// Removes what is at `path`, but no directory, and makes a file with exactly `content` there: the
/// old one may be root's, by a link or a second name. The permissions are those of a regular file
/// that was there, else 0666 less the umask. Failures are ignored.
void write_file(const char* path, std::string_view content) noexcept;

}  // namespace fs

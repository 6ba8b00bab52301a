#pragma once

#include <string>
#include <string_view>

/// The two things done with the content of files. Both are silent: a file that cannot be read or
/// written is as good as none. They have to be: in a process started without standard error, the
/// file that is open may have its number, and a line printed meanwhile would land in it.
/// Only a regular file counts; a FIFO or a device in its place is neither opened nor waited for.
namespace fs {

/// The first word of the file at `path`, links followed: the bytes (NULs included) between leading
/// white space of the C locale and the next white space or the end of the file. Empty when the file
/// is missing, not regular, cannot be read to the word's end, holds nothing but white space, or
/// when the word does not end within 64 MiB or the memory there is: a file of holes must not cost a
/// boot. Prints and throws nothing.
[[nodiscard]] std::string read_first_word(const char* path) noexcept;

/// Makes the file at `path` hold exactly `content`; a new file gets mode 0666 less the umask. A
/// link at `path` is a failure: it could lead to a file of root's. Failures are ignored. Prints and
/// throws nothing.
void write_file(const char* path, std::string_view content) noexcept;

}  // namespace fs

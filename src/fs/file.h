#pragma once

#include <string>
#include <string_view>

/// Reading and writing small files. Both are silent: a file that cannot be read or written counts
/// as missing. Only regular files are opened, never a FIFO or a device.
namespace fs {

/// The first word of the file at `path`, links followed: the bytes (NULs included) between leading
/// white space of the C locale and the next white space or the end of the file. Empty when the file
/// is missing, not regular, blank, or cannot be read. Also empty when the word does not end within
/// the file's first 64 MiB or the available memory: a sparse file must not cost a boot. Prints and
/// throws nothing.
[[nodiscard]] std::string read_first_word(const char* path) noexcept;

/// Makes the file at `path` hold exactly `content`; a new file gets mode 0666 less the umask. A
/// symbolic link at `path`, or a file that has a second name, is not written: the directory's owner
/// may have put a file of root's there. Failures are ignored. Prints and throws nothing.
void write_file(const char* path, std::string_view content) noexcept;

}  // namespace fs

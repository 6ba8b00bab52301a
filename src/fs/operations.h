#pragma once

#include <string>

/// The file-system operations of the program. They turn a failed system call into a printed
/// message followed by an exception, a plain `int` with the call's error number, and take a
/// missing entry for a normal outcome. Paths and link contents are NUL-terminated byte strings,
/// handed to the system call unchanged.
namespace fs {

/// Removes the entry at `path`: a link itself, never what it points at; never a directory.
/// A path that does not exist is fine.
/// On failure prints "remove: could not remove %s" and throws `int`.
void remove(const char* path);

/// Whether `path` exists, links followed: false for a link whose target is missing, and for any
/// failure, whose number is then in errno. Prints and throws nothing.
[[nodiscard]] bool exists(const char* path) noexcept;

/// The content of the link at `path`, as stored; no more than its first 1024 bytes.
/// Empty when nothing exists at `path`.
/// On failure (not a link, say) prints "read_symlink: %s" and throws `int`; throws std::bad_alloc
/// where there is no memory for the content.
[[nodiscard]] std::string read_symlink(const char* path);

/// Makes a link at `link` with the content `target`, which need not exist. Replaces nothing:
/// an entry at `link`, even a link whose target is missing, is a failure.
/// On failure prints "create_symlink: from %s to %s" (the link's path first) and throws `int`.
void create_symlink(const char* target, const char* link);

/// Puts a link with the content `target` in the place of the link or file at `link`, if any, in one
/// step: whoever looks sees what stood there or the new link. It is made at `new_link`, beside
/// `link`, and renamed. What stands at `new_link` belongs to another run that is at work or was
/// killed: it has ten milliseconds to go away, and is removed then.
/// False where this cannot be done (a directory stands at `link`, say) and `link` is as it was.
/// Prints and throws nothing.
[[nodiscard]] bool replace_symlink(const char* target, const char* link,
                                   const char* new_link) noexcept;

}  // namespace fs

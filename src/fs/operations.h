#pragma once

#include <string>

/// The file-system operations of the program. A failed system call is printed and then thrown, as
/// a plain `int` with the call's error number; a missing entry is a normal outcome. Paths and link
/// contents are NUL-terminated byte strings and reach the system call unchanged.
namespace fs {

/// Removes the entry at `path`: a link itself, never its target; never a directory.
/// Does nothing where `path` does not exist.
/// On failure prints "remove: could not remove %s" and throws `int`.
void remove(const char* path);

/// Whether `path` exists, links followed: false for a link whose target is missing, and for any
/// failure, whose number is then in errno. Prints and throws nothing.
[[nodiscard]] bool exists(const char* path) noexcept;

/// The content of the link at `path`, as stored; no more than its first 1024 bytes. Empty when
/// nothing exists at `path`. Without memory for it throws std::bad_alloc.
/// On failure (not a link, for example) prints "read_symlink: %s" and throws `int`.
[[nodiscard]] std::string read_symlink(const char* path);

/// Makes a link at `link` with the content `target`, which need not exist. Replaces nothing:
/// an entry at `link`, even a link whose target is missing, is a failure.
/// On failure prints "create_symlink: from %s to %s" (the link's path first) and throws `int`.
void create_symlink(const char* target, const char* link);

/// Whether `link` is a link with exactly the content `target`. Prints and throws nothing, and
/// leaves errno as it was.
[[nodiscard]] bool is_symlink_to(const char* target, const char* link) noexcept;

/// Makes sure that a link with the content `target` is at `staged`, the name beside a link that is
/// to be replaced. Another run may have made it already; any other link is removed first.
/// False where it cannot be made, for example because something that is no link is there, with the
/// number in errno. Prints and throws nothing.
[[nodiscard]] bool stage_symlink(const char* target, const char* staged) noexcept;

/// Removes the link at `staged`; what is seen to be no link stays. Silent; leaves errno as it was.
void unstage_symlink(const char* staged) noexcept;

/// To be called when a link could not be staged or renamed. If errno says that the storage is full,
/// prints "create_symlink: from %s to %s" and throws `int`: to remove a link may make no room. Does
/// nothing on tmpfs and ext4 without a free inode, where it does; XFS may still refuse a link.
void require_room(const char* target, const char* link);

/// Replaces the link or file at `link`, if any, by a link with the content `target`, in one step:
/// it is staged at `staged` and renamed, so every reader finds the old entry or the new link.
/// False where this cannot be done (a directory is at `link`, for example): `link` is unchanged,
/// and no link is at `staged`. Throws what `require_room` throws; both are unchanged then.
[[nodiscard]] bool replace_symlink(const char* target, const char* link, const char* staged);

}  // namespace fs

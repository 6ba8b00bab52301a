#pragma once

#include <initializer_list>
#include <string_view>

namespace fs {

/// Prints one line on standard error, in one write:
///
///     kestrel: MESSAGE: ERROR TEXT
///
/// `error` is the error number of the failed call that the message is about, or 0 ("Success")
/// where a message tells of a decision and no call failed. MESSAGE is `format` with each "%s"
/// replaced by the next of `texts`, up to that text's first NUL byte; there are as many texts as
/// "%s", at most two.
///
/// A handler that adds a message to a failure finds the number in errno: everything in this
/// program that throws leaves it there, 0 where no call failed.
///
/// Never called while a file or a directory is open: in a process started without standard error
/// it may have that number, and the line would land in it.
///
/// Throws nothing, allocates nothing and leaves errno as it was; a write that fails is not
/// reported anywhere.
void report(int error, std::string_view format,
            std::initializer_list<const char*> texts = {}) noexcept;

}  // namespace fs

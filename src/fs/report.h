#pragma once

#include <initializer_list>
#include <string_view>

namespace fs {

/// Prints the line "kestrel: MESSAGE: ERROR TEXT" on standard error, in one write. `error` is the
/// error number of the failed call that the message is about, or 0 ("Success") where no call
/// failed. MESSAGE is `format` with each "%s" replaced by the next of `texts`, up to that text's
/// first NUL byte; there are as many texts as "%s", at most two.
///
/// A handler that adds a message to a failure finds the number in errno: everything in this program
/// that throws sets it, to 0 where no call failed.
///
/// Never called while a file is open for writing: in a process that was started without standard
/// error, the line would be written into it. Throws nothing, allocates nothing and leaves errno as
/// it was. A failed write is ignored.
void report(int error, std::string_view format,
            std::initializer_list<const char*> texts = {}) noexcept;

}  // namespace fs

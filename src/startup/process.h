#pragma once

/// Makes sure that nothing about the process ends the run or misdirects a message, however it was
/// started; to be called once, first of all. A closed pipe or a file-size limit is then an
/// ordinary failed write, and no file that is opened later becomes standard error. Where memory is
/// lacking even for an exception, the run ends with status 0. Prints and throws nothing.
void guard_process() noexcept;

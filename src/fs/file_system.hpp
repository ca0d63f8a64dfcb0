#pragma once

#include <string>

/// The file-system operations of the links and their data. A failure that an operation does not tolerate is reported
/// and raised by `warn_and_raise`; the failed call has changed nothing on disk.
namespace fs {

/// Reports the failed C library call that has just set errno: writes the message, ": " and the text of errno to
/// standard error through `warn`.
///
/// Throws the errno value as an `int`.
[[noreturn, gnu::format(printf, 1, 2)]] void warn_and_raise(const char* format, ...);

/// Deletes a file or a symbolic link itself, never a directory. A path that does not exist counts as deleted.
///
/// Throws errno as `unlink` sets it: EISDIR for a directory.
void remove(const std::string& path);

/// Returns whether the path exists once every link is followed: false for a dangling link.
bool path_exists(const std::string& path) noexcept;

/// Returns the bytes that the link stores, cut to the first 1024; empty when nothing stands at `path`.
/// The target itself need not exist.
///
/// Throws errno as `readlink` sets it: EINVAL for anything but a link.
std::string read_symlink(const std::string& path);

/// Makes a link at `link` that holds the text `target`, which is not examined.
///
/// Throws errno as `symlink` sets it: EEXIST when anything, even a dangling link, stands at `link`; that stays as it
/// was.
void create_symlink(const std::string& target, const std::string& link);

/// Returns the first word of a text file: leading white space is skipped, the word ends at the next white space or
/// at the end of the file. Empty, without a warning, when the file cannot be read or is blank.
std::string first_word(const std::string& path);

}  // namespace fs

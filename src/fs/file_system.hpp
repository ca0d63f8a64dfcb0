#pragma once

#include <string>
#include <string_view>

/// The file-system operations of the links and their data. Each failure that an operation does not tolerate is reported
/// and raised by `warn_and_raise`; the failed call has changed nothing on disk.
namespace fs {

/// Reports the failed C library call that has just set errno: writes the message, ": " and the text of errno to
/// standard error through `warn`.
///
/// Throws the errno value as an `int`.
[[noreturn, gnu::format(printf, 1, 2)]] void warn_and_raise(const char* format, ...);

/// Deletes a file or a symbolic link itself, never a directory. A path that does not exist counts as deleted.
///
/// Throws errno as `unlink` sets it. For a directory that is EISDIR on Linux, EPERM on other systems.
void remove(const char* path);

/// Returns whether the path exists once every link is followed: false for a dangling link.
bool path_exists(const char* path) noexcept;

/// Returns the bytes that the link holds, cut to the first 1024; empty when nothing exists at `path`. The target itself
/// need not exist.
///
/// Throws errno as `readlink` sets it: EINVAL for anything but a link.
std::string read_symlink(const char* path);

/// Creates a link at `link` that holds the text `target`, which is not examined.
///
/// Throws errno as `symlink` sets it: EEXIST when anything, even a dangling link, is at `link`; that stays as it was.
void create_symlink(const char* target, const char* link);

/// Returns the first word in the first 16 MiB of a file: the bytes from the first that is not white space up to the
/// next white space. Empty, without a warning, when there is none, the file cannot be read or is not a regular one.
/// Never waits for a FIFO or a device.
std::string first_word(const char* path);

/// Replaces the content of a file, which is created with mode 0666 less the umask if it does not exist. What exists and
/// is not a regular file is left alone, and never waited for. A failure gives no warning; the file may then be empty,
/// or hold the beginning of the text.
void write_file(const char* path, std::string_view text) noexcept;

}  // namespace fs

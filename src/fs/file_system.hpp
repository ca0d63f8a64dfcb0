#pragma once

#include <string>
#include <string_view>

/// File-system operations. An operation that fails changes nothing on disk and calls `warn_and_raise`, unless its
/// comment says otherwise.
namespace fs {

/// Warns with the message and the text of errno, then throws the errno value as an `int`.
[[noreturn, gnu::format(printf, 1, 2)]] void warn_and_raise(const char* format, ...);

/// Deletes a file, or a link itself, never a directory (EISDIR on Linux). Does nothing if the path does not exist.
void remove(const char* path);

/// Returns whether the path exists once every link is followed: false for a dangling link.
bool path_exists(const char* path) noexcept;

/// Returns the target of the link, cut to 1024 bytes; empty when nothing is there. Throws EINVAL for anything but a
/// link.
std::string read_symlink(const char* path);

/// Creates a link. Throws EEXIST when anything, even a dangling link, is in its place; nothing is replaced.
void create_symlink(const char* target, const char* link);

/// Returns the first word in the first 16 MiB of a regular file, empty, without a warning, when there is none. Never
/// waits for a FIFO or a device.
std::string first_word(const char* path);

/// Replaces the content of a regular file, or creates it with mode 0666 less the umask. Never waits for a FIFO or a
/// device. A link is followed. A failure causes no warning; the file may then be empty or incomplete.
void write_file(const char* path, std::string_view text) noexcept;

}  // namespace fs

#pragma once

#include <functional>
#include <map>
#include <string>
#include <string_view>
#include <vector>

/// Where the tests run: a private mount namespace, with the program's real paths on fresh file systems.
///
/// A situation is a list of statements, separated by ", ". Their paths are relative to /var/db/timezone:
///   system VERSION SCHEMA    the system partition's data; "-" leaves the version or the schema file out
///   dataset VERSION SCHEMA   an installed dataset; "-" leaves the ICU data file out
///   live system              the zoneinfo link leads to the system partition, no icutz link
///   live VERSION             both links lead to the dataset
///   latest VERSION           tz_latest leads to the dataset
///   marker                   an empty needs_cleanup
///   record TEXT              TZVersionDiffRecord holds the text
///   PATH > TARGET            a link; "@" at the front of a target stands for /var/db/timezone/tz/
///   PATH = TEXT              a file
///   PATH /                   a directory
///   - PATH                   nothing at PATH
namespace sandbox {

/// Moves this process into the sandbox, or ends it with the reason. The machine's own paths stay as they are.
void enter();

/// Clears the sandbox and builds a situation. Unless this says otherwise the state directory is there, with a local
/// time link to Europe/Paris.
void stage(std::string_view situation);

/// All that stands below /var and /usr/share: path to "> TARGET", "= TEXT" or "/".
using disk = std::map<std::string, std::string>;
disk read_disk();

/// What `before` becomes when statements, but for the first two kinds, are carried out.
disk changed(disk before, std::string_view statements);

struct outcome {
  int status = 0;                     // what a pass returned
  std::string thrown;                 // empty, a standard exception's text, or that of an int taken for errno
  std::vector<std::string> warnings;  // without the program's name
};

[[nodiscard]] outcome observe(const std::function<void()>& action);

/// A situation, and what an action makes of it.
struct expectation {
  std::string situation;
  std::string changes;  // statements
  std::vector<std::string> warnings = {};
  std::string thrown = {};
  int status = 0;
};

/// Stages the situation, runs the action and fails the test unless all is as expected.
void check(const expectation& expected, const std::function<outcome()>& run);

/// One pass in this process.
outcome run_pass();

/// One pass of the shipped binary; `prepare` is called in the new process before it starts.
outcome run_release_binary(const std::function<void()>& prepare = [] {});

/// Fails the test unless the warnings are the expected ones. An expected one may leave out the text of errno, with
/// which every warning ends.
void expect_warnings(const std::vector<std::string>& warnings, const std::vector<std::string>& expected);

/// Calls `visit` with every string of up to `longest` bytes out of `alphabet`.
void for_each_string(std::string_view alphabet, std::size_t longest,
                     const std::function<void(const std::string&)>& visit);

}  // namespace sandbox

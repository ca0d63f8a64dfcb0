#include "fs/file_system.hpp"

#include <gtest/gtest.h>
#include <unistd.h>

#include <cerrno>
#include <functional>
#include <utility>

#include "sandbox.hpp"

namespace {

using namespace std::string_literals;
using sandbox::changed, sandbox::expect_warnings, sandbox::observe, sandbox::read_disk, sandbox::stage;

const std::string at = "/var/db/timezone/";

struct failure {
  const char* situation;
  std::function<void()> action;
  int raised;
  const char* warning;
};

TEST(FileSystem, FailuresWarnRaiseAndChangeNothing) {
  const failure table[] = {
      {"x /", [] { fs::remove(at + "x"); }, EISDIR, "remove: could not remove /var/db/timezone/x: Is a directory"},
      {"x =", [] { fs::remove(at + "x/y"); }, ENOTDIR,
       "remove: could not remove /var/db/timezone/x/y: Not a directory"},
      {"x =", [] { fs::read_symlink(at + "x"); }, EINVAL, "read_symlink: /var/db/timezone/x: Invalid argument"},
      {"x /", [] { fs::read_symlink(at + "x"); }, EINVAL, "read_symlink: /var/db/timezone/x: Invalid argument"},
      {"x =", [] { fs::read_symlink(at + "x/y"); }, ENOTDIR, "read_symlink: /var/db/timezone/x/y: Not a directory"},
      {"%s%n /", [] { fs::remove(at + "%s%n"); }, EISDIR,
       "remove: could not remove /var/db/timezone/%s%n: Is a directory"},
      {"x = text", [] { fs::create_symlink("t", at + "x"); }, EEXIST,
       "create_symlink: from /var/db/timezone/x to t: File exists"},
      {"x > nowhere", [] { fs::create_symlink("t", at + "x"); }, EEXIST,
       "create_symlink: from /var/db/timezone/x to t: File exists"},
      {"", [] { fs::create_symlink("t", at + "no/x"); }, ENOENT,
       "create_symlink: from /var/db/timezone/no/x to t: No such file or directory"},
  };
  for (const auto& row : table) {
    stage(row.situation);
    const auto before = read_disk();
    const auto result = observe(row.action);
    EXPECT_EQ(result.thrown, std::to_string(row.raised)) << row.warning;
    expect_warnings(result.warnings, {row.warning});
    EXPECT_EQ(read_disk(), before) << row.warning;
  }
}

TEST(FileSystem, RaisesTheErrnoOfTheCallWhenTheWarningItselfFails) {
  stage("x /");
  const auto result = observe([] {
    ::close(STDERR_FILENO);
    fs::remove(at + "x");
  });
  EXPECT_EQ(result.thrown, std::to_string(EISDIR));
}

TEST(FileSystem, WhatIsNoFailureIsSilent) {
  stage("file =, dangling > nowhere, directory /");
  const auto before = read_disk();
  const auto result = observe([] {
    fs::remove(at + "absent");
    fs::remove("");
    EXPECT_EQ(fs::read_symlink(at + "absent"), "");
    EXPECT_EQ(fs::read_symlink(at + "absent/link"), "");
    EXPECT_EQ(fs::read_symlink(at + "dangling"), "nowhere");
    EXPECT_TRUE(fs::path_exists(at + "directory"));
    EXPECT_FALSE(fs::path_exists(at + "dangling"));
    fs::remove(at + "dangling");
    fs::remove(at + "file");
    fs::create_symlink("../any text", at + "made");
  });
  EXPECT_EQ(result.thrown, "");
  expect_warnings(result.warnings, {});
  EXPECT_EQ(read_disk(), changed(before, "- dangling, - file, made > ../any text"));
}

TEST(FileSystem, LinkTargetsAreReadUpTo1024Bytes) {
  for (const std::size_t length : {1023U, 1024U, 1025U, 4000U}) {
    const auto target = std::string(length - 1, 'a') + "b";
    stage("x > " + target);
    EXPECT_EQ(fs::read_symlink(at + "x"), target.substr(0, 1024));
  }
}

TEST(FileSystem, FirstWord) {
  const std::pair<std::string, std::string> table[] = {
      {"2020a\n", "2020a"},
      {"2020a", "2020a"},
      {"  2020a and more\n", "2020a"},
      {"\t\n\v\f\r 2020a\t", "2020a"},
      {"", ""},
      {" \n", ""},
      {"2020\0a x"s, "2020\0a"s},
      {"2020\xff", "2020\xff"},
      {std::string(1 << 20, '7') + "\n", std::string(1 << 20, '7')},
  };
  for (const auto& [content, word] : table) {
    stage("x = " + content);
    EXPECT_EQ(fs::first_word(at + "x"), word) << testing::PrintToString(content.substr(0, 40));
  }
  const auto result = observe([] {
    EXPECT_EQ(fs::first_word(at + "tz"), "") << "a directory";
    EXPECT_EQ(fs::first_word(at + "absent"), "");
  });
  expect_warnings(result.warnings, {});
}

}  // namespace

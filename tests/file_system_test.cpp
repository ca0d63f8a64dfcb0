#include "fs/file_system.hpp"

#include <gtest/gtest.h>
#include <unistd.h>

#include <functional>
#include <utility>

#include "sandbox.hpp"

namespace {

using namespace std::string_literals;
using sandbox::check, sandbox::expect_warnings, sandbox::expectation, sandbox::observe, sandbox::stage;

const std::string at = "/var/db/timezone/";

TEST(FileSystem, FailuresWarnRaiseAndChangeNothing) {
  const std::string no_link = "create_symlink: from /var/db/timezone/x to t: ";
  const std::pair<std::function<void()>, expectation> table[] = {
      {[] { fs::remove(at + "x"); },
       {"x /", "", {"remove: could not remove /var/db/timezone/x: Is a directory"}, "Is a directory"}},
      {[] { fs::remove(at + "x/y"); },
       {"x =", "", {"remove: could not remove /var/db/timezone/x/y: Not a directory"}, "Not a directory"}},
      {[] { fs::remove(at + "%s%n"); },
       {"%s%n /", "", {"remove: could not remove /var/db/timezone/%s%n: Is a directory"}, "Is a directory"}},
      {[] { fs::read_symlink(at + "x"); },
       {"x =", "", {"read_symlink: /var/db/timezone/x: Invalid argument"}, "Invalid argument"}},
      {[] { fs::read_symlink(at + "x"); },
       {"x /", "", {"read_symlink: /var/db/timezone/x: Invalid argument"}, "Invalid argument"}},
      {[] { fs::read_symlink(at + "x/y"); },
       {"x =", "", {"read_symlink: /var/db/timezone/x/y: Not a directory"}, "Not a directory"}},
      {[] { fs::create_symlink("t", at + "x"); }, {"x = text", "", {no_link + "File exists"}, "File exists"}},
      {[] { fs::create_symlink("t", at + "x"); }, {"x > nowhere", "", {no_link + "File exists"}, "File exists"}},
      {[] { fs::create_symlink("t", at + "x"); },
       {"- .", "", {no_link + "No such file or directory"}, "No such file or directory"}},
  };
  for (const auto& [action, row] : table) {
    check(row, [&, &a = action] { return observe(a); });
  }
}

TEST(FileSystem, RaisesTheErrnoOfTheCallWhenTheWarningItselfFails) {
  stage("x /");
  const auto result = observe([] {
    ::close(STDERR_FILENO);
    fs::remove(at + "x");
  });
  EXPECT_EQ(result.thrown, "Is a directory");
}

TEST(FileSystem, WhatIsNoFailureIsSilent) {
  const auto actions = [] {
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
  };
  check({"file =, dangling > nowhere, directory /", "- dangling, - file, made > ../any text"},
        [&] { return observe(actions); });
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

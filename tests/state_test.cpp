#include "boot/state.hpp"

#include <gtest/gtest.h>

#include "sandbox.hpp"

namespace {

TEST(State, DatasetPathFromLink) {
  const std::pair<std::string, std::string> accepted[] = {
      {"/var/db/timezone/tz/2020a.1.0/zoneinfo", "/var/db/timezone/tz/2020a.1.0"},
      {"/var/db/timezone/tz/2020a.1.0/icutz", "/var/db/timezone/tz/2020a.1.0"},
      {"/var/db/timezone/tz/a/b/zoneinfo", "/var/db/timezone/tz/a/b"},
      {"/var/db/timezone/tz/x/", "/var/db/timezone/tz/x"},
      {"/var/db/timezone/tz///", "/var/db/timezone/tz//"},
      {"/usr/share/zoneinfo.default", ""},
  };
  for (const auto& [target, path] : accepted) {
    EXPECT_EQ(boot::dataset_path_from_link(target), path) << target;
  }
  for (const std::string target :
       {"/var/db/timezone/tz/2020a.1.0", "/var/db/timezone/tz//zoneinfo", "/var/db/timezone/tz/",
        "/var/db/timezone/tz//", "/var/db/timezone/tz", "/usr/share/zoneinfo.default/", "/usr/share/zoneinfo", "",
        "tz/2020a.1.0/zoneinfo", "/private/var/db/timezone/tz/x/zoneinfo", "%s%n"}) {
    const auto result = sandbox::observe([&] { boot::dataset_path_from_link(target); });
    EXPECT_EQ(result.thrown, "-1") << target;
    sandbox::expect_warnings(result.warnings, {"Bad zoneinfo link " + target});
  }
}

}  // namespace

#include "version/data_version.hpp"

#include <err.h>

#include <algorithm>
#include <optional>
#include <string_view>
#include <tuple>

namespace version {
namespace {

constexpr std::string_view digits = "0123456789";
constexpr std::string_view lower_case = "abcdefghijklmnopqrstuvwxyz";

/// The four groups of ([0-9]+)([a-z]+)(?:\.([0-9]+))?(?:\.([0-9]+))? in a text that matches it as a whole. `major`
/// and `minor` are empty when not given.
struct version_groups {
  std::string_view year;
  std::string_view letters;
  std::string_view major;
  std::string_view minor;
};

/// Cuts the longest run of bytes out of `set` from the front of `text` and returns it.
std::string_view take_run(std::string_view& text, std::string_view set) {
  const auto run = text.substr(0, std::min(text.find_first_not_of(set), text.size()));
  text.remove_prefix(run.size());
  return run;
}

/// Cuts a dot and the digits behind it from the front of `text` and returns the digits. Without both, nothing is cut.
std::string_view take_dotted_number(std::string_view& text) {
  auto rest = text;
  if (!rest.starts_with('.')) {
    return {};
  }
  rest.remove_prefix(1);
  const auto number = take_run(rest, digits);
  if (!number.empty()) {
    text = rest;
  }
  return number;
}

// One pass suffices: no group can begin with a byte that the group before it can take. std::regex would dominate the
// run time, and overflow the stack at a long text.
std::optional<version_groups> match(std::string_view text) {
  version_groups groups;
  groups.year = take_run(text, digits);
  groups.letters = take_run(text, lower_case);
  groups.major = take_dotted_number(text);
  groups.minor = take_dotted_number(text);
  if (groups.year.empty() || groups.letters.empty() || !text.empty()) {
    return std::nullopt;
  }
  return groups;
}

std::int32_t number_or_absent(std::string_view number) { return number.empty() ? -1 : std::stoi(std::string(number)); }

auto in_order(const data_version& version) noexcept {
  return std::tie(version.year, version.letters, version.major, version.minor);
}

}  // namespace

data_version::data_version(const std::string& text) { parse_version(*this, text); }

void parse_version(data_version& version, const std::string& text) {
  const auto groups = match(text);
  if (!groups) {
    ::warn("Cannot parse version string %s, results.size() = 0", text.c_str());
    ::warn("Cannot parse version string %s", text.c_str());
    version = {};
    return;
  }
  version.year = std::stoi(std::string(groups->year));
  version.letters = groups->letters;
  version.major = number_or_absent(groups->major);
  version.minor = number_or_absent(groups->minor);
}

bool newer_than(const data_version& a, const data_version& b) noexcept { return in_order(a) > in_order(b); }

bool same_version(const data_version& a, const data_version& b) noexcept { return in_order(a) == in_order(b); }

}  // namespace version

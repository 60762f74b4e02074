/// Tables of cases: what a row is called in the name of its test, and where a check fails; and suites over forms.
#pragma once

#include <ostream>
#include <string>
#include <tuple>

#include <gtest/gtest.h>

#include "support/streams.h"

namespace test
{

/// For suites that are tried over forms and need nothing else; each has a name of its own for it.
class OverForms : public ::testing::TestWithParam<Form>
{
};

/// What every row begins with.
struct Row
{
  const char* name;
};

inline std::ostream& operator<<(std::ostream& out, const Row& row)
{
  return out << row.name;
}

/// For INSTANTIATE_TEST_SUITE_P: a test for each row.
inline constexpr auto kRowName = [](const auto& instance) { return std::string(instance.param.name); };

/// A test for each row and width of the group that its node is in.
inline constexpr auto kRowNameUnder = [](const auto& instance) {
  return std::get<0>(instance.param).name + std::string(std::get<1>(instance.param) ? "Under64" : "Under32");
};

} // namespace test

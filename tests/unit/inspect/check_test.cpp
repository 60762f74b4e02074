#include <cctype>
#include <charconv>
#include <string>
#include <string_view>

#include <gmock/gmock.h>

#include "inspect/streams.h"

using namespace tav::inspect;
using test::Bytes;

namespace
{

std::vector<Finding> findings(const Bytes& bytes, const tav::inspect::Form& form,
                              const std::function<bool(RuleId)>& wanted)
{
  ByteSource source("x", std::span<const uint8_t>(bytes));
  std::vector<Finding> found;
  Checker checker(source, form, wanted, [&](const Finding& finding) { found.push_back(finding); });
  while (checker.step())
  {
  }
  return found;
}

uint64_t numberAt(std::string_view text, size_t& at)
{
  uint64_t value = 0;
  const auto [end, error] = std::from_chars(text.data() + at, text.data() + text.size(), value);
  EXPECT_TRUE(error == std::errc());
  at = static_cast<size_t>(end - text.data());
  return value;
}

/// The bytes of a rule's example: hexadecimal, "00*9" nine times a byte, "(...)*9" a run nine times.
Bytes bytesOfExample(std::string_view text)
{
  Bytes bytes;
  size_t run = 0; // where what may be repeated begins
  size_t group = std::string::npos;
  for (size_t at = 0; at < text.size();)
  {
    const char c = text[at];
    if (c == ' ' || c == ')')
    {
      run = c == ')' ? group : run;
      ++at;
    }
    else if (c == '(')
    {
      group = bytes.size();
      ++at;
    }
    else if (c == '*')
    {
      ++at;
      const Bytes repeated(bytes.begin() + static_cast<ptrdiff_t>(run), bytes.end());
      for (uint64_t n = numberAt(text, at); n > 1; --n)
      {
        bytes.insert(bytes.end(), repeated.begin(), repeated.end());
      }
    }
    else
    {
      run = bytes.size();
      uint8_t byte = 0;
      std::from_chars(text.data() + at, text.data() + at + 2, byte, 16);
      bytes.push_back(byte);
      at += 2;
    }
  }
  return bytes;
}

} // namespace

TEST(Checker, FindsEachRuleInItsExampleAtItsOffset)
{
  for (const Rule& rule : rules())
  {
    SCOPED_TRACE(rule.id);
    const Bytes bytes = bytesOfExample(rule.bytes);
    const auto found =
        findings(bytes, rule.form, [&](RuleId wanted) { return wanted == rule.rule; });
    ASSERT_EQ(found.size(), 1U);
    EXPECT_EQ(found.front().rule, rule.rule);
    EXPECT_EQ(found.front().offset, rule.offset);
    EXPECT_FALSE(found.front().sentence.empty());
    EXPECT_TRUE(std::islower(static_cast<unsigned char>(found.front().sentence.front())) != 0 ||
                std::isdigit(static_cast<unsigned char>(found.front().sentence.front())) != 0);
  }
}

TEST(Checker, FindsNothingWrongWhatTheLibraryWrites)
{
  // What a tree may hold on purpose: elements and types that nobody knows, values of a wrong size.
  const auto wanted = [](RuleId id) {
    const Rule& rule = ruleOf(id);
    return !rule.note && id != RuleId::typeUnknown && id != RuleId::elementUnknown && id != RuleId::sizeType;
  };
  for (uint64_t seed = 0; seed < 300; ++seed)
  {
    SCOPED_TRACE(seed);
    const test::Tree tree = test::randomTree(seed, {.forget = false});
    for (const Finding& finding : findings(test::bytesOfTree(tree), test::readForm(tree.form), wanted))
    {
      ADD_FAILURE() << ruleOf(finding.rule).id << " at " << finding.offset << ": " << finding.sentence;
    }
  }
}

TEST(Checker, FindsSomethingWrongWhereAHeaderIsOverwritten)
{
  const auto all = [](RuleId id) { return !ruleOf(id).note; };
  for (uint64_t seed = 0; seed < 200; ++seed)
  {
    const test::Tree tree = test::randomTree(seed, {.forget = false});
    if (tree.root.children.empty())
    {
      continue;
    }
    SCOPED_TRACE(seed);
    Bytes bytes = test::bytesOfTree(tree);
    const uint64_t at = tree.root.children.front().offset;
    std::fill_n(bytes.begin() + static_cast<ptrdiff_t>(at), tree.root.children.front().wide ? 16 : 8, uint8_t{0xEE});
    EXPECT_FALSE(findings(bytes, test::readForm(tree.form), all).empty());
  }
}

TEST(Checker, TellsOfAStreamInAnotherFormBehindTheStream)
{
  Bytes bytes = test::namedStream(1);
  const size_t second = bytes.size();
  const Bytes other = test::namedStream(2, true);
  bytes.insert(bytes.end(), other.begin(), other.end());
  const auto found = findings(bytes, {}, [](RuleId id) { return id == RuleId::behindStream; });
  ASSERT_FALSE(found.empty());
  EXPECT_EQ(found[0].offset, second);
  EXPECT_TRUE(found[0].otherStream);
}

TEST(Rules, AreFoundByTheirIds)
{
  for (const Rule& rule : rules())
  {
    EXPECT_EQ(findRule(rule.id), &rule);
    EXPECT_EQ(&ruleOf(rule.rule), &rule);
  }
  EXPECT_EQ(findRule("no-such-rule"), nullptr);
}

// Each code has a sentence of its own, and problems are told in one line.
#include <set>
#include <string>

#include <gmock/gmock.h>

#include "tav/codes.h"
#include "tav/inspect/phrases.hpp"
#include "tav/inspect/problem.hpp"

using namespace tav::inspect;

TEST(CodeSentences, AreThoseOfTheListAndNoTwoAreAlike)
{
  std::set<std::string_view> seen;
#define TAV_CHECK(name, value, sentence)    \
  EXPECT_EQ(codeSentence(value), sentence); \
  EXPECT_TRUE(seen.insert(sentence).second) << #name;
  TAV_CODE_LIST(TAV_CHECK)
#undef TAV_CHECK
  EXPECT_FALSE(seen.contains(codeSentence(0xDEADBEEF)));
}

TEST(CodeSentences, StandInTheLineOfAProblem)
{
  EXPECT_EQ(problemLine({.sentence = "is odd"}), "is odd");
  EXPECT_EQ(problemLine({.file = "x.tav", .sentence = "is odd"}), "x.tav: is odd");
  EXPECT_EQ(problemLine({.file = "x.tav", .offset = 16, .sentence = "is odd"}), "x.tav: 0x10: is odd");
  EXPECT_EQ(problemLine({.file = "x.tav", .offset = 16, .path = "/system", .sentence = "is odd"}),
            "x.tav: 0x10 /system: is odd");
  EXPECT_EQ(problemLine({.path = "/system", .sentence = "is odd", .code = TAV_RC_NOT_FOUND}),
            "/system: is odd (TAV_RC_NOT_FOUND)");
}

TEST(CodeSentences, AreThoseOfAFailureWithAFile)
{
  for (const char* const file : {"x.tav", ""})
  {
    try
    {
      failAt(file, TAV_RC_NOT_FOUND, "look elsewhere");
      FAIL();
    }
    catch (const Error& error)
    {
      EXPECT_EQ(error.problem().file, *file != 0 ? "x.tav" : "''");
      EXPECT_EQ(error.problem().sentence, codeSentence(TAV_RC_NOT_FOUND));
      EXPECT_EQ(error.problem().hint, "look elsewhere");
      EXPECT_EQ(tav::codeOf(error.code()), TAV_RC_NOT_FOUND);
    }
  }
}

TEST(Counts, AreOfOneOrOfSeveral)
{
  EXPECT_EQ(byteText(0), "0 bytes");
  EXPECT_EQ(byteText(1), "1 byte");
  EXPECT_EQ(byteText(9999), "9999 bytes");
  EXPECT_EQ(byteText(10000), "9.8 KiB");
  EXPECT_EQ(byteText(~uint64_t{0}), "16.0 EiB");
  EXPECT_EQ(counted(1, "node"), "1 node");
  EXPECT_EQ(counted(0, "node"), "0 nodes");
}

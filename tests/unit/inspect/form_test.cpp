// Recognising a form leaves out what cannot change the answer: held against all ways tried to their ends.
#include <random>
#include <span>
#include <string>
#include <vector>

#include <gmock/gmock.h>

#include "inspect/streams.h"
#include "inspect/walk/trial.h"
#include "tav/inspect/form.hpp"

using namespace tav::inspect;
using test::Bytes;

namespace
{

std::string written(const Recognition& found)
{
  std::string text = formText(found.form) + (found.form.extra ? ", extra" : "") + (found.isStream ? ", stream" : "") +
                     (found.damagedStart ? ", damaged start" : "") + ", looked at " + std::to_string(found.looked) +
                     "\n";
  for (const tav::inspect::Form& form : found.alternatives)
  {
    text += "or " + formText(form) + (form.extra ? ", extra" : "") + "\n";
  }
  for (const tav::inspect::Form& form : found.possible)
  {
    text += "possible " + formText(form) + (form.extra ? ", extra" : "") + "\n";
  }
  for (const Reason& reason : found.because)
  {
    text += reason.sentence + " " + std::to_string(reason.other.value_or(0)) + "\n";
  }
  return text;
}

void expectSame(const Bytes& bytes)
{
  ByteSource source("x", std::span<const uint8_t>(bytes));
  std::vector<FormChoice> choices = {{}, {.root64 = true, .aligned = true}};
  for (const bool given : {false, true})
  {
    choices.push_back({.swapped = given});
    choices.push_back({.root64 = given});
    choices.push_back({.aligned = given});
  }
  for (size_t at = 0; at < choices.size(); ++at)
  {
    SCOPED_TRACE(at);
    EXPECT_EQ(written(recognise(source, choices[at])), written(recogniseByAll(source, choices[at])));
  }
}

/// Bytes that hold less of a stream than it had, or more.
Bytes changed(Bytes bytes, uint64_t seed)
{
  std::mt19937_64 random(seed);
  switch (seed % 5)
  {
  case 0: return test::damaged(std::move(bytes), seed);
  case 1: bytes.resize(bytes.size() - random() % bytes.size()); return bytes;
  case 2: bytes.erase(bytes.begin(), bytes.begin() + static_cast<ptrdiff_t>(random() % bytes.size())); return bytes;
  case 3: bytes.resize(bytes.size() + random() % 3000); return bytes;
  default:
    for (size_t left = random() % 300; left != 0; --left)
    {
      bytes.push_back(static_cast<uint8_t>(random()));
    }
    return bytes;
  }
}

} // namespace

class FormShortened : public testing::TestWithParam<int>
{
protected:
  static uint64_t first() { return cases().first; }
  static uint64_t end() { return cases().first + cases().count; }

private:
  static test::Cases cases() { return test::casesOf(150, static_cast<uint64_t>(GetParam()) * 1000); }
};

TEST_P(FormShortened, SaysTheSameOfRandomTrees)
{
  for (uint64_t seed = first(); seed < end(); ++seed)
  {
    SCOPED_TRACE(seed);
    const test::TreeLimits limits{.depth = 4, .width = 6, .payload = 30, .forget = seed % 2 != 0};
    const Bytes bytes = test::bytesOfTree(test::randomTree(seed, limits));
    expectSame(bytes);
    expectSame(changed(bytes, seed));
  }
}

TEST_P(FormShortened, SaysTheSameOfStreamsWithNames)
{
  for (uint64_t seed = first(); seed < end(); ++seed)
  {
    SCOPED_TRACE(seed);
    const Bytes bytes = test::namedStream(seed, seed % 2 != 0, seed % 3 == 0);
    expectSame(bytes);
    expectSame(changed(bytes, seed));
    Bytes two = bytes;
    const Bytes other = test::namedStream(seed + 1, seed % 4 < 2, seed % 3 == 1);
    two.insert(two.end(), other.begin(), other.end());
    expectSame(two);
  }
}

TEST_P(FormShortened, SaysTheSameOfNoise)
{
  for (uint64_t seed = first(); seed < end(); ++seed)
  {
    SCOPED_TRACE(seed);
    std::mt19937_64 random(seed);
    Bytes bytes(random() % 600);
    const uint64_t most = seed % 3 == 0 ? 256 : 3;
    for (uint8_t& byte : bytes)
    {
      byte = static_cast<uint8_t>(random() % most);
    }
    expectSame(bytes);
  }
}

INSTANTIATE_TEST_SUITE_P(Parts, FormShortened, testing::Range(0, 4));

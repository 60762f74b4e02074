/// What comes back of small streams when they are damaged in one place, each place in turn. golden/recovery.txt has the
/// accounts: from which offset of the damage to which one, nodes that came back, what was mended, lost bytes as offset
/// and length ("-" where they go to the end of the file), with "?" nodes in doubt, and a hash of the stream that was
/// made. Where a change means to recover differently, TAV_WRITE_ACCOUNTS=golden/recovery.txt writes them anew, and the
/// difference is to be read.
#include <algorithm>
#include <sstream>
#include <string>
#include <vector>

#include <gtest/gtest.h>

#include "inspect/recoverySamples.h"
#include "inspect/writtenAccounts.h"

using namespace tav::inspect;
using test::Bytes;
using test::Sample;

namespace
{

Bytes upTo(const Bytes& sound, size_t at)
{
  return {sound.begin(), sound.begin() + static_cast<ptrdiff_t>(at)};
}

Bytes from(const Bytes& sound, size_t at)
{
  return {sound.begin() + static_cast<ptrdiff_t>(std::min(at, sound.size())), sound.end()};
}

Bytes joined(Bytes first, const Bytes& second)
{
  first.insert(first.end(), second.begin(), second.end());
  return first;
}

/// Other bytes in the place of as many, as far as the stream goes.
Bytes with(Bytes sound, size_t at, const Bytes& other)
{
  std::copy_n(other.begin(), std::min(other.size(), sound.size() - at), sound.begin() + static_cast<ptrdiff_t>(at));
  return sound;
}

Bytes changed(Bytes sound, size_t at, uint8_t bits)
{
  sound[at] ^= bits;
  return sound;
}

struct Damaging
{
  const char* name;
  size_t step; ///< from one offset to the next
  Bytes (*damaged)(const Bytes& sound, size_t at);
};

const std::vector<Damaging> kDamages{
    {"cut off", 1, upTo},
    {"its lowest bit turned", 1, [](const Bytes& sound, size_t at) { return changed(sound, at, 0x01); }},
    {"its highest bit turned", 1, [](const Bytes& sound, size_t at) { return changed(sound, at, 0x80); }},
    {"16 zeros", 1, [](const Bytes& sound, size_t at) { return with(sound, at, Bytes(16, 0)); }},
    {"16 other bytes", 3, [](const Bytes& sound, size_t at) { return with(sound, at, Bytes(16, 0x5A)); }},
    {"19 bytes more", 3,
     [](const Bytes& sound, size_t at) {
       return joined(upTo(sound, at), joined(Bytes(19, 0x5A), from(sound, at)));
     }},
    {"7 bytes less", 3, [](const Bytes& sound, size_t at) { return joined(upTo(sound, at), from(sound, at + 7)); }},
    {"begins there", 3, from},
};

uint32_t hashOf(const Bytes& bytes)
{
  uint32_t value = 2166136261U;
  for (const uint8_t byte : bytes)
  {
    value = (value ^ byte) * 16777619U;
  }
  return (value ^ value >> 16) & 0xFFFF;
}

/// A reason in short, in which the number of bytes is kept.
std::string inShort(const std::string& reason)
{
  const std::vector<std::pair<std::string, std::string>> known{
      {"no node is whole", ""},
      {"an end element whose group is lost", " end"},
      {"a damaged pair of an end element", " end pair"},
      {"a damaged pair", " pair"},
      {"a node of an unknown type", " type"},
      {"a node of a size that its type does not have", " size"},
      {"an end element whose group began ", " end of -"},
  };
  for (const auto& [text, abbreviation] : known)
  {
    if (reason == text)
    {
      return abbreviation;
    }
    if (text.back() == ' ' && reason.starts_with(text))
    {
      return abbreviation + reason.substr(text.size(), reason.find(' ', text.size()) - text.size());
    }
  }
  return " " + reason;
}

std::string runOf(uint64_t offset, uint64_t length, uint64_t size)
{
  return std::to_string(offset) + (offset + length == size ? "-" : "+" + std::to_string(length));
}

/// What is recovered of a stream, in a line.
std::string accountOf(const Bytes& bytes, const tav::inspect::Form& form)
{
  ByteSource source("x", std::span<const uint8_t>(bytes));
  test::Made made;
  std::ostringstream gone;
  const auto loss = [&](const Loss& lost) {
    gone << ", " << runOf(lost.offset, lost.length, bytes.size()) << inShort(lost.reason);
  };
  const auto doubt = [&](const Doubt& doubted) {
    const bool eyes = doubted.reason.find("eye catchers") != std::string::npos;
    gone << ", ?" << runOf(doubted.offset, doubted.length, bytes.size()) << (eyes ? " eyes" : "");
  };
  const RecoveryTotals totals = recover(source, form, made.file(), {.lost = loss, .doubted = doubt});
  EXPECT_EQ(totals.kept + totals.lost, bytes.size());
  std::ostringstream text;
  text << totals.nodes;
  const std::vector<std::pair<const char*, uint64_t>> counts{{" closed", totals.closed},
                                                             {" made", totals.made},
                                                             {" pairs", totals.pairs},
                                                             {" ends", totals.ends},
                                                             {" zeros", totals.zeros}};
  for (const auto& [name, count] : counts)
  {
    text << (count != 0 ? name + (" " + std::to_string(count)) : "");
  }
  text << gone.str() << ": " << std::hex << hashOf(made.bytes());
  return text.str();
}

/// The accounts of a sample with one kind of damage; those that are alike in one line.
void tell(std::ostream& out, const Sample& sample, const Damaging& damage)
{
  out << "\n"
      << sample.name << ": " << damage.name << "\n";
  std::string account;
  size_t first = 0;
  size_t last = 0;
  for (size_t at = 0; at < sample.bytes.size(); at += damage.step)
  {
    const std::string now = accountOf(damage.damaged(sample.bytes, at), sample.form);
    if (at != 0 && now != account)
    {
      out << first << ".." << last << " " << account << "\n";
      first = at;
    }
    account = now;
    last = at;
  }
  out << first << ".." << last << " " << account << "\n";
}

} // namespace

TEST(RecoveryAccounts, AreAsWrittenDownForDamageAnywhere)
{
  std::ostringstream found;
  for (const Sample& sample : test::recoverySamples())
  {
    found << "\n"
          << sample.name << "\n"
          << accountOf(sample.bytes, sample.form) << "\n";
    for (const Damaging& damage : kDamages)
    {
      tell(found, sample, damage);
    }
  }
  test::expectWritten(found.str(), "golden/recovery.txt", "TAV_WRITE_ACCOUNTS");
}

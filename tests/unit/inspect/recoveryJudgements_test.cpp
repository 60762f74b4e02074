/// What is thought of each place of small streams as the beginning of a node, sound, seen from within a group, and
/// damaged. golden/judgements.txt has it: of the sound stream all offsets that anything speaks for, of the others those
/// of which something else is thought. TAV_WRITE_JUDGEMENTS=golden/judgements.txt writes them anew, and the difference
/// is to be read.
#include <map>
#include <optional>
#include <sstream>
#include <string>

#include <gtest/gtest.h>

#include "inspect/judged.h"
#include "inspect/recoverySamples.h"
#include "inspect/writtenAccounts.h"

using namespace tav::inspect;
using test::Bytes;
using test::Judged;
using test::Sample;

namespace
{

using Thoughts = std::map<std::string, std::string>; ///< by offset and width

/// With leading zeros, so that the order of texts is that of places.
std::string placeOf(uint64_t offset)
{
  const std::string text = std::to_string(offset);
  return std::string(3 - text.size(), '0') + text;
}

std::string ofProber(const Prober& prober, uint64_t at, bool wide, uint64_t limit)
{
  std::string text;
  const auto belief = static_cast<int>(prober.judge(at, wide, limit));
  text += belief > 1 ? " b" + std::to_string(belief) : "";
  TAVHeader header{};
  text +=
      belief > 1 && prober.header(at, wide, limit, header) && prober.isFollowed(header, limit) ? " before another" : "";
  text += prober.isChain(at, wide, limit) ? " chain" : "";
  text += prober.isChain(at, wide, limit, true) ? " to the end" : "";
  const std::optional<uint64_t> distance = prober.pairAt(at, limit);
  text += wide && distance ? " pair of " + std::to_string(*distance) : "";
  return text;
}

std::string ofJudge(const Judged& it, uint64_t at, bool wide)
{
  const Judge& judge = it.judge;
  const uint64_t size = it.bytes.size();
  const Candidate found = judge.look(at, wide);
  std::string text;
  const auto say = [&](bool is, const std::string& what) { text += is ? " " + what : ""; };
  if (found.trust != Trust::none)
  {
    say(true, "t" + std::to_string(static_cast<int>(found.trust)) + " .." +
                  (found.end > size ? "?" : std::to_string(found.end)));
    say(found.pairBytes != 0, "bad pair");
    say(found.pairMissing, "no pair");
    say(found.open, "open");
    say(found.data.extra, "extra");
    say(found.data.otherOrder, "other order");
    say(judge.isConfirmed(found), "confirmed");
    say(judge.isWorthTaking(found, 0, size), "taken");
    for (const uint64_t back : {uint64_t{0}, uint64_t{7}, uint64_t{8}})
    {
      say(at >= back && judge.isWorthTaking(found, at - back, size), "-" + std::to_string(back));
    }
    say(Judge::isStrange(found), "strange");
    say(judge.isDamagedEnd(found, size), "bad end");
    say(judge.isRun(at, wide), "run");
    say(judge.holdsRun(at, at + 1), "holds");
  }
  const auto belief = static_cast<int>(judge.beliefAt(at, wide, it.place.sureLimit()));
  say(belief > 1, "B" + std::to_string(belief));
  say(judge.goesOn(at, wide), "on");
  say(wide && judge.isBoundary(at), "boundary");
  Bytes window(it.bytes.begin() + static_cast<ptrdiff_t>(at), it.bytes.end());
  window.resize(64);
  say(judge.isSure(window.data(), at, wide), "sure");
  say(judge.leadsTo(at, wide, size), "leads to the end");
  say(judge.leadsTo(at, wide, size / 2), "to the middle");
  uint64_t end = 0;
  const bool stranger = judge.endOfStranger(found.header(), size, end);
  say(stranger, "stranger to " + std::to_string(end));
  return text;
}

/// Where a search goes on from each offset: as far as from the one before it where nothing is said.
void addRestarts(Thoughts& all, Judged& it, const tav::inspect::Form& form)
{
  for (const auto& [name, wide, either] :
       {std::tuple{"64", true, false}, std::tuple{"32", false, false}, std::tuple{"64 or 32", true, true}})
  {
    std::string before;
    for (uint64_t at = 0; at < it.bytes.size(); ++at)
    {
      const Restart restart = Prober(it.source, form, kNoOffset).findRestart(at, wide, either, it.bytes.size());
      const std::string now = " " + std::to_string(restart.offset) + (restart.byPair ? " by a pair" : "");
      if (now != before)
      {
        all["search for " + std::string(name) + " from " + placeOf(at)] = now;
      }
      before = now;
    }
  }
}

/// Groups are entered before it is asked.
Thoughts thoughtsOf(const Bytes& bytes, const tav::inspect::Form& form, const std::vector<OpenGroup>& groups = {})
{
  Judged it(bytes, form);
  for (const OpenGroup& group : groups)
  {
    it.place.enter(group);
  }
  Thoughts all;
  for (uint64_t at = 0; at < bytes.size(); ++at)
  {
    for (const bool wide : {true, false})
    {
      std::string text = ofProber(it.judge.prober(), at, wide, it.place.sureLimit()) + ofJudge(it, at, wide);
      if (!text.empty())
      {
        all[placeOf(at) + (wide ? " w" : " n")] = std::move(text);
      }
    }
  }
  if (groups.empty())
  {
    addRestarts(all, it, form);
  }
  return all;
}

void tell(std::ostream& out, const std::string& title, const Thoughts& thoughts, const Thoughts& known)
{
  out << "\n"
      << title << "\n";
  for (const auto& [place, text] : thoughts)
  {
    const auto same = known.find(place);
    if (same == known.end() || same->second != text)
    {
      out << place << text << "\n";
    }
  }
  for (const auto& [place, text] : known)
  {
    if (!thoughts.contains(place))
    {
      out << place << " -\n";
    }
  }
}

} // namespace

TEST(RecoveryJudgements, AreAsWrittenDown)
{
  std::ostringstream found;
  for (const Sample& sample : test::recoverySamples())
  {
    const uint64_t size = sample.bytes.size();
    const Thoughts sound = thoughtsOf(sample.bytes, sample.form);
    tell(found, sample.name, sound, {});
    for (const bool wide : {true, false})
    {
      const OpenGroup root{.start = 0, .limit = size - 20, .wide = wide};
      OpenGroup sure = root;
      sure.sure = true;
      OpenGroup fixed = root;
      fixed.fixed = true;
      OpenGroup inner{.start = 16, .limit = size / 2, .wide = wide};
      const std::string name = sample.name + ": in a group of " + (wide ? "64" : "32") + "-bit headers, ";
      tell(found, name + "not confirmed", thoughtsOf(sample.bytes, sample.form, {root}), sound);
      tell(found, name + "confirmed", thoughtsOf(sample.bytes, sample.form, {sure, inner}), sound);
      tell(found, name + "fixed", thoughtsOf(sample.bytes, sample.form, {fixed, inner}), sound);
    }
    for (uint64_t at = 3; at < size; at += 29)
    {
      Bytes noise = sample.bytes;
      std::fill_n(noise.begin() + static_cast<ptrdiff_t>(at), std::min<uint64_t>(9, size - at), uint8_t{0x5A});
      tell(found, sample.name + ": noise at " + std::to_string(at), thoughtsOf(noise, sample.form), sound);
    }
    for (uint64_t at = 5; at < size; at += 37)
    {
      const Bytes cut(sample.bytes.begin(), sample.bytes.begin() + static_cast<ptrdiff_t>(at));
      tell(found, sample.name + ": cut at " + std::to_string(at), thoughtsOf(cut, sample.form), sound);
    }
  }
  test::expectWritten(found.str(), "golden/judgements.txt", "TAV_WRITE_JUDGEMENTS");
}

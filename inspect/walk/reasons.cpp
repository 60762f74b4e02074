#include "inspect/walk/reasons.h"

#include <algorithm>
#include <string>

#include "tav/inspect/path.hpp"
#include "tav/inspect/phrases.hpp"

namespace tav::inspect
{

namespace
{

void explainPadding(const std::vector<Trial>& trials, std::vector<Reason>& because)
{
  const Trial& best = trials.front();
  if (best.alignBits != 0)
  {
    because.push_back({std::to_string(best.alignBits) + " of " + counted(best.wide, "64-bit header") +
                       " announce padding to 8"});
    return;
  }
  if (best.wide != 0 && !best.form.aligned)
  {
    because.push_back({"no 64-bit header announces padding"});
    return;
  }
  const auto other = std::find_if(trials.begin(), trials.end(), [&](const Trial& t) {
    return t.form.swapped == best.form.swapped && t.form.root64 == best.form.root64 &&
           t.form.aligned != best.form.aligned;
  });
  if (other == trials.end())
  {
    return;
  }
  const bool same = other->signature == best.signature;
  because.push_back({same                ? "with and without padding to 8 the same nodes are found"
                     : best.form.aligned ? "nodes are found on the way only when payloads are padded to 8"
                                         : "nodes are found on the way only when payloads are not padded"});
}

} // namespace

std::vector<Reason> explainForm(const std::vector<Trial>& trials, const Recognition& result,
                                const Dictionary& dictionary)
{
  const Trial& best = trials.front();
  std::vector<Reason> because;
  if (result.damagedStart)
  {
    because.push_back({"the first node is damaged; the first whole one is at " + hexOffset(best.first.offset())});
  }
  else
  {
    because.push_back({"the first header, read as " + std::string(best.form.root64 ? "64" : "32") + "-bit " +
                       orderText(best.form) + ", is that of a group, " + elementText(best.first.elm(), dictionary)});
  }
  because.push_back({std::to_string(best.named) + " of the first " + counted(best.nodes, "node") +
                     " have an element of the dictionary and a size that suits the type"});
  if (best.damages != 0)
  {
    because.push_back({counted(best.damages, "place") + " among them cannot be read in any way"});
  }
  if (best.eyes + best.otherEyes != 0)
  {
    because.push_back({counted(best.eyes, "eye catcher") + " in this byte order, " + std::to_string(best.otherEyes) +
                       " in the other"});
  }
  if (best.otherAt != 0)
  {
    because.push_back({"at " + hexOffset(best.otherAt) + " " + otherStreamText(best.otherForm), best.otherAt});
  }
  explainPadding(trials, because);
  if (best.extras + best.plainStrings != 0)
  {
    because.push_back({std::to_string(best.extras) + " of " + counted(best.extras + best.plainStrings, "UTF-8 string") +
                       " have two uncounted bytes behind them"});
  }
  return because;
}

} // namespace tav::inspect

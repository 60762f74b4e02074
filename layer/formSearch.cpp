#include "layer/formSearch.h"

#include <algorithm>

#include "tav/byteOrder.h"

namespace tav::detail
{

namespace
{

std::string formText(const StreamForm& form)
{
  return std::string(form.swapped == kor::isLittleEndian ? "big-endian" : "little-endian") + ", " +
         (form.wide ? "64" : "32") + "-bit root header, " + (form.aligned ? "padded to 8" : "not padded");
}

} // namespace

uint32_t FormSearch::run(const StreamForm* given, StreamForm& form, std::string& sentence)
{
  std::vector<StreamForm> possible;
  overrunning_.clear();
  for (const bool swapped : {false, true})
  {
    for (const bool wide : {true, false})
    {
      if (const uint32_t rc = tryForm({swapped, wide, false}, possible); rc != TAV_RC_OK)
      {
        return rc;
      }
    }
  }
  if (possible.empty())
  {
    possible = overrunning_; // cut off, whatever it is
  }
  if (possible.empty())
  {
    sentence = "the file is no stream";
    return TAV_RC_NOT_FOUND;
  }
  return given != nullptr ? compare(*given, possible, form, sentence) : choose(possible, form, sentence);
}

uint32_t FormSearch::tryForm(StreamForm form, std::vector<StreamForm>& possible)
{
  RootSearch<FileBytes> search(bytes_, form);
  TAVHeader root;
  bool there = false;
  bool fits = false;
  uint32_t rc = readHeader(bytes_, form, form.wide, 0, root, there);
  there = there && layout::isGroup(root) && (form.wide || layout::typeOf(root) == TAV_TYPE_HEADER32);
  rc = rc == TAV_RC_OK && there ? search.hasFittingChild(root, fits) : rc;
  if (rc != TAV_RC_OK || !there || !fits)
  {
    return rc;
  }
  if (form.wide)
  {
    form.aligned = (layout::infoOf(root) & TAV_INFO_ALIGNED8) != 0;
    keep(form, root, possible);
    return rc;
  }
  for (const bool aligned : {false, true}) // no flag says
  {
    form.aligned = aligned;
    rc = follow(form, root, fits);
    if (rc != TAV_RC_OK)
    {
      return rc;
    }
    if (fits)
    {
      keep(form, root, possible);
    }
  }
  return rc;
}

/// Two 32-bit headers can be taken for a 64-bit one, with a size beyond the end of the file.
void FormSearch::keep(const StreamForm& form, const TAVHeader& root, std::vector<StreamForm>& possible)
{
  const bool overruns = !layout::isSizeUnknown(root) && endOfGroup(root) > bytes_.size();
  (overruns ? overrunning_ : possible).push_back(form);
}

/// Whether the first nodes below a root with a 32-bit header follow each other so.
uint32_t FormSearch::follow(const StreamForm& form, const TAVHeader& root, bool& fits)
{
  constexpr int enough = 1000;
  const uint64_t end = std::min(endOfGroup(root), bytes_.size());
  uint64_t at = layout::kHeaderSize32;
  fits = true;
  for (int i = 0; i < enough && at < end && fits; ++i)
  {
    TAVHeader node;
    bool there = false;
    const uint32_t rc = readHeader(bytes_, form, false, at, node, there);
    const bool blank = layout::typeOf(node) == 0;
    uint64_t rest = at;
    if (rc != TAV_RC_OK || !there)
    {
      return rc;
    }
    if (blank && layout::isSizeUnknown(root) && skipZeros(bytes_, at, rest) == TAV_RC_OK && rest == bytes_.size())
    {
      return rc; // the zeros behind the end
    }
    const bool isGroup = layout::isGroup(node);
    const uint64_t length = isGroup ? layout::kHeaderSize32 : lengthOfNode(node, form.aligned);
    const uint64_t claimed = isGroup && !layout::isSizeUnknown(node) ? endOfGroup(node) : at + length;
    fits = !blank && (claimed <= endOfGroup(root) || layout::isSizeUnknown(root));
    at = layout::addSaturated(at, length);
  }
  return TAV_RC_OK;
}

uint32_t FormSearch::compare(const StreamForm& given, const std::vector<StreamForm>& possible, StreamForm& form,
                             std::string& sentence)
{
  for (const StreamForm& one : possible)
  {
    if (one.swapped == given.swapped && one.wide == given.wide && one.aligned == given.aligned)
    {
      form = given;
      return TAV_RC_OK;
    }
  }
  sentence = "the file is " + formText(possible.front()) + "; the options say " + formText(given);
  return TAV_RC_BAD_OPTIONS;
}

uint32_t FormSearch::choose(const std::vector<StreamForm>& possible, StreamForm& form, std::string& sentence)
{
  form = possible.front();
  if (possible.size() == 1)
  {
    return TAV_RC_OK;
  }
  for (const StreamForm& one : possible)
  {
    sentence += (sentence.empty() ? "the file can be " : " or ") + formText(one);
  }
  sentence += ": StreamOptions have to say which";
  return TAV_RC_BAD_OPTIONS;
}

} // namespace tav::detail

#include "tools/shell/dictionary.h"

#include <vector>

#include "tools/host/host.h"
#include "tools/shell/input.h"

namespace tav::tool
{

namespace
{

/// All of one rank: none of them is more right than another.
Dictionary together(const std::vector<std::string>& files)
{
  Dictionary all;
  for (const std::string& file : files)
  {
    all = all.with(Dictionary::read(*openText(file)));
  }
  return all;
}

} // namespace

Dictionary givenDictionary(const Invocation& invocation)
{
  return together(invocation.all("--dictionary")).over(together(host::pathList("TAV_DICTIONARY")));
}

Dictionary dictionaryFor(const Invocation& invocation, const std::string& file)
{
  const Dictionary given = givenDictionary(invocation);
  return file == "-" ? given : given.over(Dictionary::beside(file));
}

} // namespace tav::tool

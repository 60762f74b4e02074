/// What is behind the handles of tav_c.h, and what keeps exceptions from going through it.
#pragma once

#include <cstdint>
#include <exception>
#include <new>
#include <optional>
#include <string>
#include <system_error>
#include <utility>
#include <vector>

#include "inspect/document/search.h"
#include "inspect/document/state.h"
#include "tav/inspect/document.hpp"
#include "tav/inspect/phrases.hpp"
#include "tav/inspect/problem.hpp"
#include "tav/tav_c.h"

namespace tav::inspect
{

/// The last failure of a handle, kept as it is and made into a text when that is asked for.
struct Failed
{
  Problem problem{};
  bool isThere = false;
  bool wantsPath = false; ///< of the node at the problem's offset
  std::string text{};

  void clear()
  {
    isThere = false;
    wantsPath = false;
  }
  void set(Problem what) noexcept
  {
    problem = std::move(what);
    isThere = true;
  }
};

/// Calls `work`, which answers a code; what it throws becomes one. Every function of tav_c.h goes through here.
template<class Work>
uint32_t guarded(Failed* failed, Work&& work) noexcept
try
{
  try
  {
    if (failed != nullptr)
    {
      failed->clear();
    }
    return work();
  }
  catch (const Error& error)
  {
    if (failed != nullptr)
    {
      failed->set(error.problem());
    }
    return codeOf(error.code()) != TAV_RC_OK ? codeOf(error.code()) : uint32_t{TAV_RC_BAD_PARAM};
  }
  catch (const std::system_error& error)
  {
    const uint32_t code = codeOf(error.code());
    if (failed != nullptr)
    {
      failed->set(Problem{.sentence = error.what()});
    }
    return code != TAV_RC_OK ? code : uint32_t{KOR_RC_OS_ERROR};
  }
}
catch (...) // the one thing left to be thrown is that memory is short, also while a failure is kept
{
  return TAV_RC_NO_MEMORY;
}

/// Keeps a failure that was no exception, and passes its code on.
inline uint32_t failed(Failed& place, uint32_t code, std::string sentence)
{
  place.set(Problem{.sentence = std::move(sentence), .code = code});
  return code;
}

/// What a form given from outside says; nothing for values that are none. Null says nothing.
std::optional<FormChoice> choiceOf(const tav_form* form);

} // namespace tav::inspect

/// A reader of the C interface.
struct tav_reader
{
  explicit tav_reader(tav::inspect::Document&& opened)
      : document(std::move(opened))
  {
  }

  tav::inspect::DocumentState& state() const { return tav::inspect::DocumentState::of(document); }

  tav::inspect::Document document;
  mutable tav::inspect::Failed failure{};
  mutable std::vector<uint8_t> window{}; ///< the payload of a file's node that was handed out last
};

/// @file session.h
/// What one worker holds: a file of the page, how it is read, and the levels that the tree shows.
#pragma once

#include <array>
#include <cstdint>
#include <memory>
#include <string>
#include <vector>

#include "tav/inspect.hpp"
#include "web/module/json.h"
#include "web/module/tree.h"

namespace tav::web
{

/// The page's choice for a part of the form.
enum class Choice : uint32_t
{
  findOut,
  first, ///< little-endian, 32-bit root, not padded
  second ///< big-endian, 64-bit root, padded
};

struct Session
{
  static constexpr uint64_t kRing = uint64_t{4} << 20U; ///< of a file in memory
  static constexpr size_t kTexts = 4;

  std::unique_ptr<inspect::ByteSource> source{};
  inspect::Dictionary dictionary{};
  inspect::FormChoice choice{};
  inspect::Recognition recognition{};
  std::vector<std::unique_ptr<Level>> levels{}; ///< the first one: the roots
  std::array<std::string, kTexts> texts{};      ///< arguments of the next call
  Json answer{};

  /// The one of this module: a worker is for one file.
  static Session& here();

  inspect::ByteSource& bytes() const;
  const inspect::Form& form() const { return recognition.form; }
  Level& level(uint32_t number) const;
};

/// Opens a file of the page and finds out its form, unless it is said.
std::unique_ptr<inspect::ByteSource> openSource(const std::string& name, const inspect::Dictionary& dictionary);
inspect::FormChoice choiceOf(Choice order, Choice bits, Choice padding);

void putForm(Json& out, const inspect::Form& form);
/// A row of the tree, or a node that was found.
void putRow(Json& out, const inspect::Walker& walker, const inspect::Event& event);

/// Hands a piece of an answer over while the work goes on.
void emit(const Json& json);
/// Tells how far the work is, by offset; now and then.
void tellProgress(uint64_t offset);

/// Runs what an export does: what it throws becomes the answer.
template<class Work>
void answer(const Work& work)
{
  Session& session = Session::here();
  Json& out = session.answer;
  out.clear();
  try
  {
    out.begin('{');
    work(session, out);
    out.end('}');
  }
  catch (const inspect::Error& error)
  {
    out.clear();
    out.begin('{').field("error", problemLine(error.problem())).field("hint", error.problem().hint);
    if (error.problem().offset)
    {
      out.field("offset", *error.problem().offset);
    }
    out.end('}');
  }
  catch (const std::exception& error)
  {
    out.clear();
    out.begin('{').field("error", error.what()).end('}');
  }
}

} // namespace tav::web

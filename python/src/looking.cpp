// Functions of the module that say something about streams.
#include <algorithm>
#include <vector>

#include "python/src/job.h"
#include "tav/inspect/checker.hpp"
#include "tav/inspect/diff.hpp"
#include "tav/inspect/json.hpp"
#include "tav/inspect/jsonText.hpp"
#include "tav/inspect/schema.hpp"

namespace tav::python
{

namespace
{

Ref optionalText(const std::optional<std::string>& text)
{
  return text ? textOf(*text) : Ref(none());
}

Ref typeText(uint16_t type)
{
  const auto name = inspect::jsonTypeName(type);
  return name ? textOf(*name) : numberOf(type);
}

/// Which rules are looked for: those that are named; none named: all, with notes where they are asked for.
std::vector<bool> wantedRules(PyObject* ids, bool notes)
{
  std::vector<bool> wanted(static_cast<size_t>(inspect::RuleId::count), false);
  if (ids == Py_None)
  {
    for (const inspect::Rule& rule : inspect::rules())
    {
      wanted[static_cast<size_t>(rule.rule)] = !rule.note || notes;
    }
    return wanted;
  }
  const Ref items = made(PySequence_Fast(ids, "rules are a list of their ids"));
  for (Py_ssize_t i = 0; i < PySequence_Fast_GET_SIZE(items.get()); ++i)
  {
    const std::string id = bytesOfText(PySequence_Fast_GET_ITEM(items.get(), i));
    const inspect::Rule* const rule = inspect::findRule(id);
    if (rule == nullptr)
    {
      fail(TAV_RC_BAD_PARAM, "there is no rule '" + id + "'");
    }
    wanted[static_cast<size_t>(rule->rule)] = true;
  }
  return wanted;
}

Ref findingTuple(const inspect::Finding& finding)
{
  const inspect::Rule& rule = inspect::ruleOf(finding.rule);
  const std::string id(rule.id);
  return made(Py_BuildValue("(sKNNIKO)", id.c_str(), wide(finding.offset), textOf(finding.path).release(),
                            textOf(finding.sentence).release(), rule.code, wide(finding.length),
                            rule.note ? Py_True : Py_False));
}

Ref sideTuple(const std::optional<inspect::DiffSide>& side)
{
  return !side ? Ref(none())
               : made(Py_BuildValue("(NKNN)", textOf(side->path).release(), wide(side->offset),
                                    textOf(side->type).release(), optionalText(side->value).release()));
}

Ref differenceTuple(const inspect::Difference& difference)
{
  const char* const change = difference.change == inspect::Change::removed ? "removed"
                             : difference.change == inspect::Change::added ? "added"
                                                                           : "changed";
  return made(Py_BuildValue("(sNNN)", change, sideTuple(difference.before).release(),
                            sideTuple(difference.after).release(), textOf(difference.sentence).release()));
}

Ref schemaTuple(const inspect::SchemaEntry& entry)
{
  const Ref types = made(PyList_New(0));
  for (const uint16_t type : entry.types)
  {
    done(PyList_Append(types.get(), typeText(type).get()));
  }
  return made(Py_BuildValue("(NKONNNO)", textOf(entry.path).release(), wide(entry.count), types.get(),
                            optionalText(entry.least).release(), optionalText(entry.greatest).release(),
                            (entry.distinct ? numberOf(*entry.distinct) : Ref(none())).release(),
                            entry.more ? Py_True : Py_False));
}

std::vector<inspect::Path> pathsOf(PyObject* texts, const inspect::Dictionary& dictionary)
{
  const Ref items = made(PySequence_Fast(texts, "paths are a list of texts"));
  std::vector<inspect::Path> paths;
  for (Py_ssize_t i = 0; i < PySequence_Fast_GET_SIZE(items.get()); ++i)
  {
    paths.push_back(inspect::pathOf(bytesOfText(PySequence_Fast_GET_ITEM(items.get(), i)), dictionary));
  }
  return paths;
}

class TextSink final : public inspect::Sink
{
public:
  void write(std::string_view bytes) override { text.append(bytes); }
  std::string text{};
};

} // namespace

PyObject* recognise(PyObject*, PyObject* arguments)
{
  return guarded([&] {
    PyObject* what = nullptr;
    PyObject* form = nullptr;
    done(PyArg_ParseTuple(arguments, "OO", &what, &form) - 1);
    const Job job(what, form);
    const Ref others = made(PyList_New(0));
    for (const inspect::Form& other : job.recognition.alternatives)
    {
      done(PyList_Append(others.get(), formTuple(other).get()));
    }
    const Ref because = made(PyList_New(0));
    for (const inspect::Reason& reason : job.recognition.because)
    {
      done(PyList_Append(because.get(), textOf(reason.sentence).get()));
    }
    return made(PyTuple_Pack(3, formTuple(job.form()).get(), others.get(), because.get())).release();
  });
}

PyObject* check(PyObject*, PyObject* arguments)
{
  return guarded([&] {
    PyObject* what = nullptr;
    PyObject* form = nullptr;
    PyObject* rules = nullptr;
    int notes = 0;
    PyObject* progress = nullptr;
    done(PyArg_ParseTuple(arguments, "OOOpO", &what, &form, &rules, &notes, &progress) - 1);
    const Job job(what, form);
    const std::vector<bool> wanted = wantedRules(rules, notes != 0);
    std::vector<inspect::Finding> findings;
    {
      Pass pass(progressOf(progress), job.source->size());
      inspect::Checker checker(
          *job.source, job.form(), [&](inspect::RuleId rule) -> bool { return wanted[static_cast<size_t>(rule)]; },
          [&](const inspect::Finding& finding) { findings.push_back(finding); });
      while (checker.step())
      {
        pass.at(checker.position());
      }
    }
    Ref list = made(PyList_New(0));
    for (const inspect::Finding& finding : findings)
    {
      done(PyList_Append(list.get(), findingTuple(finding).get()));
    }
    return list.release();
  });
}

PyObject* diff(PyObject*, PyObject* arguments)
{
  return guarded([&] {
    PyObject* whatA = nullptr;
    PyObject* whatB = nullptr;
    PyObject* form = nullptr;
    PyObject* pathA = nullptr;
    PyObject* pathB = nullptr;
    PyObject* ignored = nullptr;
    PyObject* progress = nullptr;
    inspect::DiffOptions options;
    int percent = 0;
    int contents = 0;
    int skips = 0;
    done(PyArg_ParseTuple(arguments, "OOOOOOdpppO", &whatA, &whatB, &form, &pathA, &pathB, &ignored,
                          &options.tolerance.amount, &percent, &contents, &skips, &progress) -
         1);
    if (!(options.tolerance.amount >= 0))
    {
      raise(PyExc_ValueError, "a tolerance is a number that is not negative");
    }
    Job a(whatA, form);
    Job b(whatB, form);
    const auto whole = [&a](PyObject* path) {
      return path == Py_None ? std::nullopt : std::optional(inspect::pathOf(bytesOfText(path), a.dictionary()));
    };
    const inspect::DiffInput inputA{*a.source, a.form(), whole(pathA)};
    const inspect::DiffInput inputB{*b.source, b.form(), whole(pathB)};
    options.tolerance.percent = percent != 0;
    options.contents = contents != 0;
    options.ignored = pathsOf(ignored, a.dictionary());
    std::vector<inspect::Difference> differences;
    {
      Pass pass(progressOf(progress), a.source->size() + b.source->size());
      Guard guardA(a, pass, skips != 0);
      Guard guardB(b, pass, skips != 0);
      options.seen = [&](inspect::ByteSource& source, const inspect::Walker& walker, const inspect::Event& event) {
        (&source == a.source.get() ? guardA : guardB).see(walker, event);
      };
      inspect::diff(inputA, inputB, options,
                    [&](const inspect::Difference& difference) { differences.push_back(difference); });
    }
    Ref list = made(PyList_New(0));
    for (const inspect::Difference& difference : differences)
    {
      done(PyList_Append(list.get(), differenceTuple(difference).get()));
    }
    return list.release();
  });
}

PyObject* schema(PyObject*, PyObject* arguments)
{
  return guarded([&] {
    PyObject* what = nullptr;
    PyObject* form = nullptr;
    int skips = 0;
    PyObject* progress = nullptr;
    done(PyArg_ParseTuple(arguments, "OOpO", &what, &form, &skips, &progress) - 1);
    PyObject* const callable = progressOf(progress);
    inspect::Schema found;
    const Ref items = made(PySequence_Fast(what, "sources are a list"));
    for (Py_ssize_t i = 0; i < PySequence_Fast_GET_SIZE(items.get()); ++i)
    {
      Job job(PySequence_Fast_GET_ITEM(items.get(), i), form);
      Pass pass(callable, job.source->size());
      Guard guard(job, pass, skips != 0);
      found.add(*job.source, job.form(),
                [&](const inspect::Walker& walker, const inspect::Event& event) { guard.see(walker, event); });
    }
    Ref list = made(PyList_New(0));
    found.each(inspect::PathStyle::whole, [&](const inspect::SchemaEntry& entry) {
      done(PyList_Append(list.get(), schemaTuple(entry).get()));
    });
    return list.release();
  });
}

PyObject* toJson(PyObject*, PyObject* arguments)
{
  return guarded([&] {
    PyObject* what = nullptr;
    PyObject* form = nullptr;
    int lines = 0;
    int safe = 0;
    PyObject* progress = nullptr;
    done(PyArg_ParseTuple(arguments, "OOppO", &what, &form, &lines, &safe, &progress) - 1);
    const Job job(what, form);
    TextSink sink;
    {
      Pass pass(progressOf(progress), job.source->size());
      inspect::toJson(*job.source, job.form(), sink,
                      {.style = lines != 0 ? inspect::JsonStyle::lines : inspect::JsonStyle::readable,
                       .safe = safe != 0,
                       .progress = [&](uint64_t offset) { pass.at(offset); }});
    }
    return textOf(sink.text).release();
  });
}

} // namespace tav::python

// Functions of the module that make streams of others, or change them.
#include <vector>

#include "python/src/job.h"
#include "python/src/names.h"
#include "python/src/values.h"
#include "tav/inspect/collect.hpp"
#include "tav/inspect/edit.hpp"
#include "tav/inspect/json.hpp"
#include "tav/inspect/recover.hpp"

namespace tav::python
{

namespace
{

template<class Piece>
Ref pieceList(const std::deque<Piece>& pieces)
{
  Ref list = made(PyList_New(0));
  for (const Piece& piece : pieces)
  {
    const Ref item =
        made(Py_BuildValue("(KKN)", wide(piece.offset), wide(piece.length), textOf(piece.reason).release()));
    done(PyList_Append(list.get(), item.get()));
  }
  return list;
}

/// The fields of tav.Report, in their order.
Ref reportTuple(const inspect::Outcome& outcome)
{
  const inspect::Account& account = outcome.taken;
  const inspect::RecoveryTotals& totals = account.totals;
  return made(Py_BuildValue("(NKKKKKKKKKKKKNN)", formTuple(account.form).release(), wide(account.bytes),
                            wide(totals.kept), wide(totals.lost), wide(totals.unread), wide(totals.zeros),
                            wide(account.written), wide(totals.nodes), wide(totals.ends), wide(totals.closed),
                            wide(totals.made), wide(totals.losses), wide(totals.doubts),
                            pieceList(account.losses).release(), pieceList(account.doubts).release()));
}

std::vector<inspect::Assignment> assignmentsOf(PyObject* pairs, const inspect::Dictionary& dictionary)
{
  const Ref items = made(PySequence_Fast(pairs, "pairs of path and value are expected"));
  std::vector<inspect::Assignment> assignments;
  for (Py_ssize_t i = 0; i < PySequence_Fast_GET_SIZE(items.get()); ++i)
  {
    PyObject* path = nullptr;
    PyObject* value = nullptr;
    done(PyArg_ParseTuple(PySequence_Fast_GET_ITEM(items.get(), i), "UO", &path, &value) - 1);
    assignments.push_back({inspect::pathOf(bytesOfText(path), dictionary), editText(value)});
  }
  return assignments;
}

} // namespace

PyObject* fromJson(PyObject*, PyObject* arguments)
{
  return guarded([&] {
    PyObject* text = nullptr;
    PyObject* form = nullptr;
    PyObject* output = nullptr;
    done(PyArg_ParseTuple(arguments, "UOO", &text, &form, &output) - 1);
    const std::string document = bytesOfText(text);
    const Told told(form);
    const inspect::Dictionary dictionary = dictionaryOf(told.dictionary);
    Product product(output);
    {
      const Pass pass(nullptr, 0);
      inspect::MemoryText source("JSON", document);
      inspect::fromJson(source, product.file(),
                        {.swapped = told.choice.swapped,
                         .root64 = told.choice.root64,
                         .aligned = told.choice.aligned,
                         .dictionary = dictionary});
      product.finish();
    }
    return product.result().release();
  });
}

PyObject* recover(PyObject*, PyObject* arguments)
{
  return guarded([&] {
    PyObject* what = nullptr;
    PyObject* form = nullptr;
    PyObject* output = nullptr;
    PyObject* search = nullptr;
    PyObject* progress = nullptr;
    done(PyArg_ParseTuple(arguments, "OOOOO", &what, &form, &output, &search, &progress) - 1);
    inspect::RecoverBestOptions options;
    if (search != Py_None)
    {
      options.search = PyLong_AsUnsignedLongLong(search);
      done(PyErr_Occurred() != nullptr ? -1 : 0);
    }
    const Job job(what, form);
    Product product(output);
    inspect::Outcome outcome;
    {
      Pass pass(progressOf(progress), job.source->size());
      options.progress = [&](uint64_t offset) { pass.at(offset); };
      outcome = inspect::recoverBest(*job.source, job.recognition, product.file(), options);
      if (outcome.taken.totals.nodes == 0)
      {
        throw inspect::Error(inspect::Problem{
            .file = job.input.name, .sentence = "nothing in it is whole", .code = TAV_RC_NOT_FOUND});
      }
      product.finish();
    }
    return made(PyTuple_Pack(2, reportTuple(outcome).get(), product.result().get())).release();
  });
}

PyObject* setValues(PyObject*, PyObject* arguments)
{
  return guarded([&] {
    PyObject* what = nullptr;
    PyObject* form = nullptr;
    PyObject* pairs = nullptr;
    PyObject* type = nullptr;
    PyObject* output = nullptr; // Py_None: bytes; the source's own path: in place
    int inPlace = 0;
    int skips = 0;
    PyObject* progress = nullptr;
    done(PyArg_ParseTuple(arguments, "OOOOOppO", &what, &form, &pairs, &type, &output, &inPlace, &skips, &progress) -
         1);
    inspect::EditOptions options;
    if (type != Py_None)
    {
      options.type = typeOf(type);
    }
    Job job(what, form);
    const std::vector<inspect::Assignment> assignments = assignmentsOf(pairs, job.dictionary());
    std::optional<Product> product;
    if (inPlace == 0)
    {
      product.emplace(output);
    }
    uint64_t changed = 0;
    uint64_t unchanged = 0;
    {
      Pass pass(progressOf(progress), job.source->size());
      Guard guard(job, pass, skips != 0);
      options.seen = [&](const inspect::Walker& walker, const inspect::Event& event) { guard.see(walker, event); };
      inspect::Editor editor(*job.source, job.form(), assignments, options);
      changed = editor.changed();
      unchanged = editor.unchanged();
      if (product)
      {
        editor.writeNew(product->file(), [&](uint64_t offset) { pass.at(offset); });
        product->finish();
      }
      else
      {
        editor.writeInPlace(job.input.name);
      }
    }
    const Ref bytes = product ? product->result() : Ref(none());
    return made(Py_BuildValue("(KKO)", wide(changed), wide(unchanged), bytes.get())).release();
  });
}

PyObject* extract(PyObject*, PyObject* arguments)
{
  return guarded([&] {
    PyObject* what = nullptr;
    PyObject* form = nullptr;
    PyObject* path = nullptr;
    PyObject* output = nullptr;
    int skips = 0;
    PyObject* progress = nullptr;
    done(PyArg_ParseTuple(arguments, "OOUOpO", &what, &form, &path, &output, &skips, &progress) - 1);
    Job job(what, form);
    const inspect::Path wanted = inspect::pathOf(bytesOfText(path), job.dictionary());
    Product product(output);
    uint64_t roots = 0;
    uint64_t nodes = 0;
    {
      Pass pass(progressOf(progress), job.source->size());
      Guard guard(job, pass, skips != 0);
      inspect::Collector collector(product.file(), {.ownWidths = true});
      collector.addFound(
          *job.source, job.form(), wanted,
          [&](const inspect::Walker& walker, const inspect::Event& event) { guard.see(walker, event); });
      collector.finish();
      roots = collector.roots();
      nodes = collector.nodes();
      product.finish();
    }
    return made(Py_BuildValue("(KKN)", wide(roots), wide(nodes), product.result().release())).release();
  });
}

} // namespace tav::python

// tav._tav.Following: a file that grows, a look at a time. What is a loop of it is in tav/_follow.py.
#include <chrono>
#include <memory>
#include <variant>
#include <vector>

#include "python/src/names.h"
#include "python/src/reader.h"
#include "python/src/values.h"
#include "tav/inspect/follow.hpp"
#include "tav/inspect/problem.hpp"
#include "tav/inspect/rules.hpp"

namespace tav::python
{

namespace
{

using inspect::Arrival;
using inspect::FileChange;

/// A node as it was when it came.
struct Came
{
  std::string path{};
  TAVHeader header{};
  uint64_t depth = 0;
  bool isGroup = false;
  bool swapped = false;
  std::vector<uint8_t> payload{};
};

/// A root that has ended, with all below it.
struct Ended
{
  inspect::Form form{};
  std::vector<uint8_t> bytes{};
};

using News = std::variant<Came, Ended, inspect::PassedOver, FileChange>;

std::vector<uint8_t> copyOf(const Arrival& arrival, uint64_t from, uint64_t size)
{
  std::vector<uint8_t> bytes(static_cast<size_t>(size));
  bytes.resize(arrival.source.read(from, bytes));
  if (bytes.size() != size)
  {
    inspect::failAt(arrival.source.name(), TAV_RC_END_OF_STORAGE, "the file became shorter while it was read");
  }
  return bytes;
}

/// A follower and what it has told.
class Work
{
public:
  Work(const std::string& path, const Told& how, bool existing, bool roots)
      : dictionary_(dictionaryOf(how.dictionary)),
        following_(path, told(roots), documentOptions(how.choice, dictionary_), {.existing = existing})
  {
  }

  uint64_t look(uint64_t most)
  {
    news_.clear();
    return following_.look(most);
  }
  void wait(std::chrono::milliseconds longest) { following_.wait(longest); }
  const std::vector<News>& news() const { return news_; }
  const inspect::Dictionary& dictionary() const { return dictionary_; }

private:
  inspect::FollowTold told(bool roots)
  {
    inspect::FollowTold told;
    if (roots)
    {
      told.rootEnd = [this](const Arrival& arrival) { takeRoot(arrival); };
    }
    else
    {
      told.node = [this](const Arrival& arrival) { takeNode(arrival); };
    }
    told.damage = [this](const inspect::PassedOver& passed) { news_.emplace_back(passed); };
    told.change = [this](FileChange change) { news_.emplace_back(change); };
    return told;
  }

  void takeNode(const Arrival& arrival)
  {
    const inspect::Node& node = arrival.node;
    Came came{inspect::pathText(arrival), node.header, node.depth, node.isGroup(), arrival.form.swapped, {}};
    if (!came.isGroup)
    {
      came.payload = copyOf(arrival, node.payloadOffset(), node.size());
    }
    news_.emplace_back(std::move(came));
  }

  void takeRoot(const Arrival& arrival)
  {
    const inspect::Node& root = arrival.node;
    Ended ended{arrival.form, copyOf(arrival, root.offset(), root.limit - root.offset())};
    ended.form.root64 = root.is64();
    news_.emplace_back(std::move(ended));
  }

  std::vector<News> news_{};
  inspect::Dictionary dictionary_;
  inspect::Following following_;
};

/// What Python is told: the kind, and what belongs to it.
struct ToPython
{
  const inspect::Dictionary& dictionary;

  Ref operator()(const Came& came) const
  {
    const uint16_t elm = layout::elmOf(came.header);
    const uint16_t type = layout::typeOf(came.header);
    const uint64_t size = layout::sizeOf(came.header);
    const bool isOpen = came.isGroup && layout::isSizeUnknown(came.header);
    const tav::detail::RawValue raw{type, came.payload.data(), size, came.swapped};
    const Ref value = came.isGroup ? Ref(none()) : made(valueOf(raw));
    const Ref length = isOpen ? Ref(none()) : numberOf(size);
    return made(Py_BuildValue("(s(OHOOOKOKO))", "node", textOf(came.path).get(), elm, tagIn(dictionary, elm).get(),
                              typeNameOf(type), value.get(), static_cast<unsigned long long>(came.header.nodeOffset),
                              length.get(), static_cast<unsigned long long>(came.depth),
                              came.isGroup ? Py_True : Py_False));
  }
  Ref operator()(const Ended& ended) const
  {
    const Ref bytes = made(PyBytes_FromStringAndSize(reinterpret_cast<const char*>(ended.bytes.data()),
                                                     static_cast<Py_ssize_t>(ended.bytes.size())));
    return made(Py_BuildValue("(s(OO))", "root", bytes.get(), formTuple(ended.form).get()));
  }
  Ref operator()(const inspect::PassedOver& passed) const
  {
    const std::string rule(inspect::ruleOf(passed.rule).id);
    return made(Py_BuildValue("(s(KKs))", "damage", static_cast<unsigned long long>(passed.offset),
                              static_cast<unsigned long long>(passed.length), rule.c_str()));
  }
  Ref operator()(FileChange change) const
  {
    static constexpr const char* kNames[] = {"missing", "appeared", "replaced", "shortened"};
    return made(Py_BuildValue("(ss)", "change", kNames[static_cast<size_t>(change)]));
  }
};

struct FollowingObject
{
  PyObject_HEAD
      std::unique_ptr<Work>
          work;
  bool busy; ///< a thread looks or waits without the interpreter
};

FollowingObject& followingOf(PyObject* self)
{
  return *reinterpret_cast<FollowingObject*>(self);
}

/// Lets other threads run while one looks or waits; none else does meanwhile.
class Turn
{
public:
  explicit Turn(FollowingObject& following)
      : following_(following)
  {
    if (following_.busy)
    {
      fail(TAV_RC_BAD_PARAM, "another thread follows with this object");
    }
    following_.busy = true;
    thread_ = PyEval_SaveThread();
  }
  Turn(const Turn&) = delete;
  Turn& operator=(const Turn&) = delete;
  ~Turn()
  {
    PyEval_RestoreThread(thread_);
    following_.busy = false;
  }

private:
  FollowingObject& following_;
  PyThreadState* thread_ = nullptr;
};

PyObject* makeFollowing(PyTypeObject* type, PyObject* arguments, PyObject* /*named*/)
{
  return guarded([&] {
    PyObject* path = nullptr;
    PyObject* form = nullptr;
    int existing = 0;
    int roots = 0;
    done(PyArg_ParseTuple(arguments, "OOpp", &path, &form, &existing, &roots) - 1);
    auto work = std::make_unique<Work>(pathOfFile(path), Told(form), existing != 0, roots != 0);
    Ref self = made(type->tp_alloc(type, 0));
    new (&followingOf(self.get()).work) std::unique_ptr<Work>(std::move(work));
    return self.release();
  });
}

void deleteFollowing(PyObject* self)
{
  PyTypeObject* const type = Py_TYPE(self);
  std::destroy_at(&followingOf(self).work);
  type->tp_free(self);
  Py_DECREF(type);
}

PyObject* look(PyObject* self, PyObject* arguments)
{
  return guarded([&] {
    unsigned long long most = 0;
    done(PyArg_ParseTuple(arguments, "K", &most) - 1);
    FollowingObject& following = followingOf(self);
    uint64_t count = 0;
    std::exception_ptr failure;
    {
      const Turn turn(following);
      try
      {
        count = following.work->look(most);
      }
      catch (...)
      {
        failure = std::current_exception(); // behind what came before it
      }
    }
    const Ref list = made(PyList_New(0));
    for (const News& news : following.work->news())
    {
      done(PyList_Append(list.get(), std::visit(ToPython{following.work->dictionary()}, news).get()));
    }
    Ref error(none());
    if (failure)
    {
      guarded([&]() -> PyObject* { std::rethrow_exception(failure); });
      PyObject* raised[3] = {};
      PyErr_Fetch(&raised[0], &raised[1], &raised[2]);
      PyErr_NormalizeException(&raised[0], &raised[1], &raised[2]);
      error = Ref(raised[1]);
      Py_XDECREF(raised[0]);
      Py_XDECREF(raised[2]);
    }
    return made(Py_BuildValue("(KOO)", static_cast<unsigned long long>(count), list.get(), error.get())).release();
  });
}

PyObject* waitFor(PyObject* self, PyObject* arguments)
{
  return guarded([&] {
    unsigned int milliseconds = 0;
    done(PyArg_ParseTuple(arguments, "I", &milliseconds) - 1);
    FollowingObject& following = followingOf(self);
    {
      const Turn turn(following);
      following.work->wait(std::chrono::milliseconds(milliseconds));
    }
    return none();
  });
}

PyMethodDef methods[] = {{"look", look, METH_VARARGS, nullptr}, {"wait", waitFor, METH_VARARGS, nullptr}, {}};

PyType_Slot slots[] = {{Py_tp_new, asSlot(makeFollowing)},
                       {Py_tp_dealloc, asSlot(deleteFollowing)},
                       {Py_tp_methods, methods},
                       {0, nullptr}};
PyType_Spec spec = {"tav._tav._Following", sizeof(FollowingObject), 0, Py_TPFLAGS_DEFAULT | Py_TPFLAGS_IMMUTABLETYPE,
                    slots};

} // namespace

void addFollowing(PyObject* module)
{
  makeType(module, spec, "_Following");
}

} // namespace tav::python

#include "scenarios.h"

#include <array>
#include <cstring>
#include <filesystem>
#include <fstream>
#include <iterator>
#include <memory>
#include <optional>
#include <ostream>
#include <sstream>

#include "support/elements.h"

namespace faults
{

using namespace test;

namespace
{

constexpr uint64_t kPage = 64;
constexpr uint64_t kRing = 3 * kPage;
constexpr uint64_t kBlock = 4096;
constexpr uint64_t kLong = 150;
constexpr uint64_t kFitting = 50;

/// A storage that is opened by a step, and again when that failed.
template<class Storage>
class Opened
{
public:
  template<class... Arguments>
  Opened(Steps& steps, const Arguments&... arguments)
      : steps_(steps)
  {
    steps.call("open", [&] {
      uint32_t rc = TAV_RC_OK;
      storage.emplace(arguments..., &rc);
      return rc;
    });
  }
  ~Opened()
  {
    steps_.run("destroy", [&] { storage.reset(); });
  }
  Opened(const Opened&) = delete;
  Opened& operator=(const Opened&) = delete;

  std::optional<Storage> storage{};

private:
  Steps& steps_;
};

class OpenedFile
{
public:
  OpenedFile(Steps& steps, const std::string& path, uint64_t options)
      : path_(path), param_{KOR_PARAM_VERSION, path_.c_str(), options, 0666}, opened_(steps, &param_)
  {
    opened_.storage->ioUnit = kPage;
  }
  TAVSSFile& storage() { return *opened_.storage; }

private:
  std::string path_;
  KORFileOpenParam param_;
  Opened<TAVSSFile> opened_;
};

class OpenedHandle
{
public:
  OpenedHandle(Steps& steps, TAVSideStorage& storage, uint64_t options)
      : steps_(steps)
  {
    TAVInitParam param(&storage, options, kRing, 0, 0, 0);
    steps.call("init", [&] { return tavInitHandle(&handle_, &param); });
  }
  ~OpenedHandle()
  {
    if (handle_ != nullptr)
    {
      steps_.call("term", [&] { return tavTermHandle(&handle_); });
    }
  }
  OpenedHandle(const OpenedHandle&) = delete;
  OpenedHandle& operator=(const OpenedHandle&) = delete;

  TAVHandle* get() { return handle_; }

private:
  Steps& steps_;
  TAVHandle* handle_ = nullptr;
};

Bytes pattern(uint8_t first, uint64_t count)
{
  Bytes bytes(count);
  for (uint64_t i = 0; i < count; ++i) bytes[i] = static_cast<uint8_t>(first + i);
  return bytes;
}

TAVHeader add(Steps& steps, TAVHandle* handle, Element node)
{
  TAVHeaderData data = node.data();
  const uint64_t before = handle->streamBytes;
  steps.call("add", [&] {
    EXPECT_EQ(handle->streamBytes, before) << "a failure leaves the write offset where it was";
    return tavAddElement(0, handle, &data);
  });
  return data.header;
}

void close(Steps& steps, TAVHandle* handle, uint64_t options = 0)
{
  steps.call("close", [&] { return tavCloseHeader(options, handle); });
}

void flush(Steps& steps, TAVHandle* handle)
{
  if (handle->pCircularBuf == nullptr)
  {
    return;
  }
  steps.call("reset", [&] { return handle->pCircularBuf->reset(); });
}

/// No group is opened with an unknown size: it would get its end element even when its size could not be written, and
/// the element's code would be the answer of the close.
/// `longest`: of an element that has to be read back, also through a ring for which memory was short.
void writeNodes(Steps& steps, TAVHandle* handle, uint64_t longest)
{
  add(steps, handle, group64(TAV_ELM_CMN_SYSTEM, TAV_TYPE_HEADER64, 0, 0));
  add(steps, handle, u32(TAV_ELM_CMN_CPU_SPEED, 7, true, TAV_INFO_EYE_SIZE));
  add(steps, handle, group64(TAV_ELM_CMN_HOST, TAV_TYPE_HEADER32, 0, 0));
  add(steps, handle, ascii(TAV_ELM_CMN_HOST_NAME, "ada", false));
  add(steps, handle, binary(7, pattern(3, longest), false));
  close(steps, handle);
  flush(steps, handle); // what is there now must not get lost any more
  const TAVHeader updated = add(steps, handle, binary(9, pattern(5, 40), true, TAV_INFO_EYE_SIZE));
  Bytes encoded(32, 0);
  steps.call("stream", [&] { return tavAddStream(0, handle, TAV_HDR_64, encoded.data(), encoded.size()); });
  add(steps, handle, group64(TAV_ELM_CMN_OS, TAV_TYPE_HEADER64, 0, 0));
  add(steps, handle, binary(10, pattern(6, 300)));
  close(steps, handle, 1);
  Bytes payload = pattern(90, 40);
  TAVHeaderData again{updated, payload.data(), payload.size(), 0};
  steps.call("update", [&] { return tavUpdateElement(0, handle, &again); });
  add(steps, handle, binary(11, pattern(7, 20), true, TAV_INFO_EYE_SIZE));
  close(steps, handle);
  flush(steps, handle);
}

std::string firstBytes(const std::string& content, uint64_t length)
{
  return content.substr(0, std::min<uint64_t>(length, content.size()));
}

/// What reading operations find, as text.
class Findings
{
public:
  Findings(Steps& steps, TAVHandle* handle)
      : steps_(steps), handle_(handle) {}

  std::string everything()
  {
    walk();
    if (!::testing::Test::HasFailure())
    {
      stepBack();
      scan();
      search();
      validate();
      print();
    }
    return text_.str();
  }

private:
  void note(const char* what, const TAVHeaderData& node)
  {
    text_ << what << ' ' << node.header.nodeOffset << ' ' << node.header.hdr64.size << '\n';
  }

  void walk()
  {
    steps_.call("child", [&] { return tavGetNextChild(0, handle_, nullptr, nullptr, &root_); });
    note("root", root_);
    TAVHeaderData node{};
    uint32_t rc = TAV_RC_OK;
    for (bool first = true; rc == TAV_RC_OK; first = false)
    {
      TAVHeader before = last_.header;
      steps_.call("child", [&] {
        rc = tavGetNextChild(0, handle_, &root_.header, first ? nullptr : &before, &node);
        return rc == TAV_RC_NO_MORE_CHILDREN ? TAV_RC_OK : rc;
      });
      if (rc == TAV_RC_OK)
      {
        note("child", node);
        last_ = node;
        if (node.header.hdr64.size != 0 && node.pDataBuf != nullptr)
        {
          text_ << "data " << int{node.pDataBuf[0]} << '\n';
        }
      }
    }
  }

  void stepBack()
  {
    TAVHeaderData before{};
    TAVHeaderData end{header64(0, TAV_TYPE_BINARY, 1, 0, last_.header.nodeOffset + 16 + 20 + 16), nullptr, 0, 0};
    steps_.call("back", [&] { return tavGetPrevNode(0, handle_, &end, &before); });
    note("back", before);
    steps_.call("index", [&] { return tavFindNodeFromIndex(0, handle_, 20, 0, &before); });
    note("index", before);
  }

  void scan()
  {
    uint64_t offset = 0;
    uint64_t distance = 0;
    bool swapped = false;
    steps_.call("scan", [&] { return tavFindEyeSizeComboInt(handle_, 60, 0, true, &offset, &distance, &swapped); });
    text_ << "scan " << offset << ' ' << distance << '\n';
  }

  void search()
  {
    TAVHeaderData found{};
    steps_.call("find", [&] {
      return tavFindElmInt(handle_, &root_.header, 0, 0, 0, TAV_ELM_CMN_HOST, nullptr, nullptr, &found);
    });
    note("find", found);
    const TAVPathEntry path[] = {{0, TAV_ELM_CMN_HOST}};
    TAVFindLogicalGroupParam param{0, path, 1, nullptr, 0};
    steps_.call("path", [&] { return tavFindLogicalGroup(0, handle_, &root_.header, &param, &found); });
    note("path", found);
  }

  void validate()
  {
    steps_.call("validate", [&] { return tavValidateHierarchy(0, handle_, &root_.header); });
    // Its end leaves out the length of its header, so that it does not take the last child in.
    uint32_t contained = TAV_RC_OK;
    steps_.call("contain", [&] {
      contained = tavValidateSubtreeInt(1, handle_, &root_.header);
      return contained == TAV_RC_OUTSIDE_PARENT ? TAV_RC_OK : contained;
    });
    text_ << "contain " << contained << '\n';
  }

  void print()
  {
    for (const uint64_t options : {0x7U, 0x47U, 0xC7U})
    {
      std::array<char, 256> piece{};
      TAVPrintParam param{0, piece.data(), piece.size(), nullptr};
      uint64_t printed = 0;
      steps_.call("print", [&] { return tavPrintSubtree(options, handle_, &root_, &param, &printed); });
      text_ << "print " << printed << '\n';
    }
  }

  Steps& steps_;
  TAVHandle* handle_;
  TAVHeaderData root_{};
  TAVHeaderData last_{};
  std::ostringstream text_;
};

} // namespace

std::ostream& operator<<(std::ostream& out, const Scenario& scenario)
{
  return out << scenario.name;
}

std::string contentOf(const std::string& path)
{
  std::ifstream file(path, std::ios::binary);
  return {std::istreambuf_iterator<char>(file), std::istreambuf_iterator<char>()};
}

namespace
{

std::string writeFileOf(Steps& steps, const std::string& path, uint64_t longest)
{
  uint64_t length = 0;
  {
    OpenedFile file(steps, path, KOR_FILE_UPDATE | KOR_FILE_CREATE | KOR_FILE_TRUNCATE);
    OpenedHandle handle(steps, file.storage(), TAV_OPT_WRITE);
    writeNodes(steps, handle.get(), longest);
    TAVSideStorage* storage = nullptr;
    steps.call("size", [&] { return tavGetSideStorage(handle.get(), &storage, &length); });
  }
  return firstBytes(contentOf(path), length);
}

} // namespace

std::string writeFile(Steps& steps, const std::string& path)
{
  return writeFileOf(steps, path, kLong);
}

std::string writeMemory(Steps& steps, const std::string&)
{
  Opened<TAVSSMemory> memory(steps, kBlock);
  OpenedHandle handle(steps, *memory.storage, TAV_OPT_WRITE);
  writeNodes(steps, handle.get(), kLong);
  return {reinterpret_cast<const char*>(handle.get()->pDirectData), handle.get()->streamBytes};
}

std::string nestDeeply(Steps& steps, const std::string&)
{
  constexpr uint64_t kDeep = 1250; // the header stack grows twice
  Opened<TAVSSMemory> memory(steps, uint64_t{kDeep * 16 + 64});
  std::string written;
  {
    OpenedHandle handle(steps, *memory.storage, TAV_OPT_WRITE);
    Element group = group64(TAV_ELM_CMN_HOST, TAV_TYPE_HEADER64, 0, 0);
    for (uint64_t i = 0; i < kDeep; ++i)
    {
      TAVHeaderData data = group.data();
      const uint64_t before = handle.get()->streamBytes;
      steps.call("nest", [&] {
        // The header is there when the stack refuses; the offset shows that it is not counted.
        handle.get()->streamBytes = before;
        return tavAddElement(0, handle.get(), &data);
      });
    }
    for (uint64_t i = 0; i < kDeep; ++i) close(steps, handle.get());
    written.assign(reinterpret_cast<const char*>(handle.get()->pDirectData), handle.get()->streamBytes);
  }
  OpenedHandle handle(steps, *memory.storage, TAV_OPT_READ);
  TAVHeaderData root{};
  steps.call("child", [&] { return tavGetNextChild(0, handle.get(), nullptr, nullptr, &root); });
  steps.call("validate", [&] { return tavValidateHierarchy(0, handle.get(), &root.header); });
  return written;
}

std::string resetHandle(Steps& steps, const std::string& path)
{
  {
    OpenedFile file(steps, path, KOR_FILE_UPDATE | KOR_FILE_CREATE | KOR_FILE_TRUNCATE);
    OpenedHandle handle(steps, file.storage(), TAV_OPT_WRITE);
    add(steps, handle.get(), group64(TAV_ELM_CMN_SYSTEM, TAV_TYPE_HEADER64, 0, 0));
    add(steps, handle.get(), binary(9, pattern(5, 100)));
    close(steps, handle.get());
    flush(steps, handle.get());
    TAVResetParam param;
    steps.call("reset handle", [&] { return tavResetHandle(handle.get(), &param); });
    writeNodes(steps, handle.get(), kLong);
    steps.call("lock", [&] { return file.storage().lock(0); });
    steps.call("unlock", [&] { return file.storage().unlock(); });
    uint64_t size = 0;
    steps.call("total", [&] { return file.storage().getTotalSize(&size); });
  }
  return contentOf(path).substr(0, 400);
}

std::string readFile(Steps& steps, const std::string& path)
{
  Steps healthy(false);
  const std::string before = writeFileOf(healthy, path, kFitting);
  std::string found;
  {
    OpenedFile file(steps, path, KOR_FILE_READ);
    OpenedHandle handle(steps, file.storage(), TAV_OPT_READ);
    found = Findings(steps, handle.get()).everything();
  }
  EXPECT_EQ(firstBytes(contentOf(path), before.size()), before) << "reading changes nothing";
  return found;
}

std::string readMemory(Steps& steps, const std::string& path)
{
  Steps healthy(false);
  std::string stream = writeMemory(healthy, path);
  stream.resize(stream.size() + 8); // a pair at the block's very end is not seen
  Bytes block(stream.begin(), stream.end());
  TAVSSMemory memory(block.data(), block.size());
  OpenedHandle handle(steps, memory, TAV_OPT_READ);
  return Findings(steps, handle.get()).everything();
}

std::string followPaths(Steps& steps, const std::string& path)
{
  const std::string folder = path + ".folder of a name that is longer than a small string is";
  const std::string file = folder + "/and a file in it whose name is no shorter than its folder's";
  std::filesystem::create_directory(folder);
  std::ofstream(file) << "x";
  std::array<char, 4096> target{};
  uint64_t nameAt = 0;
  steps.call("follow", [&] { return korFollowLinks(file.c_str(), target.data(), target.size(), &nameAt); });
  std::string names;
  names.reserve(4096);
  const auto take = [](const char* name, void* all) { static_cast<std::string*>(all)->append(name).append("\n"); };
  steps.call("list", [&] {
    names.clear();
    return korListFolder(folder.c_str(), take, &names);
  });
  steps.call("sync", [&] { return korSyncFolderOf(file.c_str()); });
  steps.call("remove", [&] { return korRemoveFile(file.c_str()); });
  return std::string(target.data() + nameAt) + '\n' + names + (std::filesystem::exists(file) ? "still there" : "gone");
}

std::string askDevice(Steps& steps, const std::string& /*path*/)
{
  uint64_t size = ~uint64_t{0};
  steps.call("device", [&] {
    KORHFile device;
    KORFileOpenParam param;
    param.pPath = "/dev/null";
    param.options = KOR_FILE_READ;
    uint32_t rc = device.open(&param);
    rc = rc == TAV_RC_OK ? device.getSize(&size) : rc;
    const uint32_t closed = device.close();
    return rc == TAV_RC_OK ? closed : rc;
  });
  return std::to_string(size);
}

} // namespace faults

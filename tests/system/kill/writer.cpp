/// Appends groups with eye/size pairs to a file, for as long as it lives or until there are as many as asked for.
///   kill_writer FILE PAGE PAGES GROUPS SEED
/// The bytes of group i are told by i alone: killed_test.py makes them without the library.
#include <cstdint>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <string>

#include "tav/tav.h"

namespace
{

[[noreturn]] void fail(const char* what, uint32_t code)
{
  std::fprintf(stderr, "%s: %s\n", what, korCodeName(code));
  std::exit(1);
}

void check(uint32_t code, const char* what)
{
  if (code != TAV_RC_OK)
  {
    fail(what, code);
  }
}

void add(TAVHandle* handle, uint16_t elm, uint16_t type, uint32_t info, const void* payload, uint64_t size)
{
  TAVHeaderData node{};
  node.header.hdr64 = {size, info, type, elm};
  node.header.hdrType = TAV_HDR_64;
  node.pDataBuf = static_cast<uint8_t*>(const_cast<void*>(payload)); // only read
  node.dataBufSize = size;
  check(tavAddElement(0, handle, &node), "tavAddElement");
}

void open(TAVHandle* handle, uint16_t elm, uint32_t info)
{
  TAVHeaderData node{};
  node.header.hdr64 = {TAV_SIZE_UNKNOWN, info, TAV_TYPE_HEADER64, elm};
  node.header.hdrType = TAV_HDR_64;
  check(tavAddElement(0, handle, &node), "tavAddElement");
}

void addGroup(TAVHandle* handle, uint32_t number)
{
  open(handle, 60002, TAV_INFO_EYE_SIZE);
  add(handle, 60003, TAV_TYPE_UINT32, TAV_INFO_EYE_SIZE, &number, sizeof number);
  const std::string text(number * 7 % 40, static_cast<char>('a' + number % 26));
  add(handle, 60103, TAV_TYPE_ASCII_STRING, 0, text.data(), text.size());
  const std::string bytes(number * 13 % 200, static_cast<char>(number));
  add(handle, 60004, TAV_TYPE_BINARY, TAV_INFO_EYE_SIZE, bytes.data(), bytes.size());
  check(tavCloseHeader(0, handle), "tavCloseHeader");
}

} // namespace

int main(int argc, char** argv)
{
  if (argc != 6)
  {
    return 2;
  }
  const auto number = [&](int at) { return std::strtoull(argv[at], nullptr, 0); };
  KORFileOpenParam file;
  file.pPath = argv[1];
  file.options = KOR_FILE_UPDATE | KOR_FILE_CREATE | KOR_FILE_TRUNCATE;
  uint32_t rc = TAV_RC_OK;
  TAVSSFile storage(&file, &rc);
  check(rc, argv[1]);
  storage.ioUnit = number(2);
  TAVInitParam param(&storage, TAV_OPT_WRITE, number(2) * number(3), 0, 0, 0);
  TAVHandle* handle = nullptr;
  check(tavInitHandle(&handle, &param), "tavInitHandle");
  open(handle, TAV_ELM_CMN_DOC_ROOT, 0);
  uint64_t random = number(5);
  for (uint64_t i = 0; i < number(4); ++i)
  {
    addGroup(handle, static_cast<uint32_t>(i));
    random = random * 6364136223846793005U + 1442695040888963407U;
    // Now and then everything goes out at once, between two groups, as a program does that wants to be sure.
    if (random >> 59 == 0)
    {
      check(handle->pCircularBuf->reset(), "reset");
    }
  }
  check(tavCloseHeader(0, handle), "tavCloseHeader");
  check(handle->pCircularBuf->reset(), "reset");
  check(tavTermHandle(&handle), "tavTermHandle");
  return 0;
}

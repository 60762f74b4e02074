#include "tav/kor.h"

#include <gtest/gtest.h>
#include <map>
#include <string>

namespace
{
struct Named
{
  uint32_t code;
  const char* name;
};

// By hand, so that a changed number or name shows.
constexpr Named kNames[] = {
    {0x00000000, "TAV_RC_OK"},
    {0x90000002, "TAV_RC_NO_MEMORY"},
    {0x90000005, "TAV_RC_NOT_SUPPORTED"},
    {0x9000000C, "TAV_RC_BAD_PARAM"},
    {0x9000000D, "TAV_RC_NO_HDR_STACK"},
    {0x90000021, "TAV_RC_END_OF_STORAGE"},
    {0x90000022, "TAV_RC_END_OF_DATA"},
    {0x90000030, "KOR_RC_NO_SUCH_FILE"},
    {0x90000031, "KOR_RC_NO_PERMISSION"},
    {0x90000032, "KOR_RC_NO_SPACE"},
    {0x90000033, "KOR_RC_IS_FOLDER"},
    {0x90000034, "KOR_RC_LOCKED"},
    {0x90000035, "KOR_RC_IO_ERROR"},
    {0x90000036, "KOR_RC_FILE_EXISTS"},
    {0x90000037, "KOR_RC_READ_ONLY"},
    {0x90000038, "KOR_RC_FILE_TOO_LARGE"},
    {0x90000039, "KOR_RC_TOO_MANY_FILES"},
    {0x9000003A, "KOR_RC_NOT_OPEN"},
    {0x9000003B, "KOR_RC_NOT_SEEKABLE"},
    {0x9000003C, "KOR_RC_WRONG_ACCESS"},
    {0x9000003D, "KOR_RC_NOT_A_FOLDER"},
    {0x9000003E, "KOR_RC_BAD_NAME"},
    {0x9000003F, "KOR_RC_NOT_LOCKED"},
    {0x90000040, "KOR_RC_TRACE_ACTIVE"},
    {0x90000041, "KOR_RC_TRACE_INACTIVE"},
    {0x90000042, "KOR_RC_BUSY"},
    {0x9000004F, "KOR_RC_OS_ERROR"},
    {0x90000594, "TAV_RC_BAD_OPTIONS"},
    {0x90000595, "TAV_RC_NO_CIRCULAR_BUF"},
    {0x90000596, "TAV_RC_NO_MORE_CHILDREN"},
    {0x90000597, "TAV_RC_OUTSIDE_PARENT"},
    {0x90000598, "TAV_STATUS_DESTROYED"},
    {0x90000599, "TAV_RC_DATA_TOO_LARGE"},
    {0x9000059A, "TAV_RC_WRONG_MODE"},
    {0x9000059B, "TAV_RC_NOT_FOUND"},
    {0x9000059C, "TAV_RC_BAD_HDR_TYPE"},
    {0x9000059D, "TAV_RC_CB_STATE"},
    {0x9000059E, "TAV_RC_BAD_CHILD_HDR"},
    {0x9000059F, "TAV_RC_BAD_PAYLOAD"},
    {0x900005A0, "TAV_RC_NO_MORE_DATA"},
};

class CodeName : public testing::TestWithParam<Named>
{
};

TEST_P(CodeName, IsTheNameOfItsConstant)
{
  EXPECT_STREQ(korCodeName(GetParam().code), GetParam().name);
}

INSTANTIATE_TEST_SUITE_P(All, CodeName, testing::ValuesIn(kNames),
                         [](const testing::TestParamInfo<Named>& row) { return std::string(row.param.name); });

#define ENTER(name, value, sentence) codes[value] = #name;
TEST(CodeNames, TheListAboveMissesNoCode)
{
  std::map<uint32_t, std::string> codes;
  TAV_CODE_LIST(ENTER)
  std::map<uint32_t, std::string> listed;
  for (const Named& row : kNames) listed[row.code] = row.name;
  EXPECT_EQ(codes, listed);
}
#undef ENTER

class UnknownCode : public testing::TestWithParam<uint32_t>
{
};

TEST_P(UnknownCode, IsCalledSo)
{
  EXPECT_STREQ(korCodeName(GetParam()), "unknown code");
}

INSTANTIATE_TEST_SUITE_P(Some, UnknownCode, testing::Values(1, 0x0000000C, 0x90000001, 0x900005A1, 0xFFFFFFFF));
} // namespace

#include <gmock/gmock.h>

#include "cpp/layer.h"

using namespace test;

TEST(LayerErrors, MessageNamesTheCodeAndSaysWhatItMeans)
{
  EXPECT_EQ(tav::makeError(TAV_RC_NOT_FOUND).message(), "TAV_RC_NOT_FOUND: nothing was found, or no group is open");
}

TEST(LayerErrors, EveryCodeHasANameAndASentence)
{
  for (const uint32_t code : {
#define CODE_ITSELF(name, value, sentence) name,
           TAV_CODE_LIST(CODE_ITSELF)
#undef CODE_ITSELF
       })
  {
    const std::string message = tav::category().message(static_cast<int>(code));
    EXPECT_THAT(message, ::testing::StartsWith(std::string(korCodeName(code)) + ": ")) << code;
    EXPECT_GT(message.size(), std::string(korCodeName(code)).size() + 2) << code;
  }
}

TEST(LayerErrors, UnknownCodeHasAMessageToo)
{
  EXPECT_EQ(tav::makeError(0x12345678).message(), "unknown code");
}

TEST(LayerErrors, CategoryIsCalledTav)
{
  EXPECT_STREQ(tav::category().name(), "tav");
}

TEST(LayerErrors, SuccessIsNoError)
{
  EXPECT_FALSE(tav::makeError(TAV_RC_OK));
}

TEST(LayerErrors, CodeComesBackOutOfAnError)
{
  EXPECT_EQ(tav::codeOf(tav::makeError(TAV_RC_OUTSIDE_PARENT)), TAV_RC_OUTSIDE_PARENT);
}

TEST(LayerErrors, ErrorOfAnotherCategoryHasNoCode)
{
  EXPECT_EQ(tav::codeOf(std::make_error_code(std::errc::io_error)), TAV_RC_OK);
}

TEST(LayerErrors, CompareWithPortableConditions)
{
  EXPECT_EQ(tav::makeError(KOR_RC_NO_SUCH_FILE), std::errc::no_such_file_or_directory);
  EXPECT_EQ(tav::makeError(KOR_RC_NO_SPACE), std::errc::no_space_on_device);
  EXPECT_EQ(tav::makeError(TAV_RC_NO_MEMORY), std::errc::not_enough_memory);
  EXPECT_EQ(tav::makeError(TAV_RC_NOT_SUPPORTED), std::errc::not_supported);
  EXPECT_EQ(tav::makeError(TAV_RC_BAD_PARAM), std::errc::invalid_argument);
  EXPECT_EQ(tav::makeError(KOR_RC_NO_PERMISSION), std::errc::permission_denied);
  EXPECT_EQ(tav::makeError(KOR_RC_IS_FOLDER), std::errc::is_a_directory);
  EXPECT_EQ(tav::makeError(KOR_RC_IO_ERROR), std::errc::io_error);
  EXPECT_EQ(tav::makeError(KOR_RC_FILE_EXISTS), std::errc::file_exists);
  EXPECT_NE(tav::makeError(TAV_RC_NOT_FOUND), std::errc::no_such_file_or_directory);
}

TEST(LayerErrors, ThrownErrorSaysWhatWasDone)
{
  const TemporaryPath missing;
  try
  {
    const tav::Reader reader(missing.path);
    FAIL() << "opened a file that is not there";
  }
  catch (const std::system_error& error)
  {
    EXPECT_EQ(error.code(), tav::makeError(KOR_RC_NO_SUCH_FILE));
    EXPECT_STREQ(error.what(), "opening a file for reading: KOR_RC_NO_SUCH_FILE: no such file or folder");
  }
}

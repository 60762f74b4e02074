#include "tav/kor.h"

const char* korCodeName(uint32_t code)
{
  switch (code)
  {
#define KOR_NAME_OF_CODE(name, value, sentence) \
  case name:                                    \
    return #name;
    TAV_CODE_LIST(KOR_NAME_OF_CODE)
#undef KOR_NAME_OF_CODE
  default:
    return "unknown code";
  }
}

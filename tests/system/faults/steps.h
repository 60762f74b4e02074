/// Scenarios are made of steps: calls of the library, during which the system's calls count and one of them may fail.
#pragma once

#include <cstdint>
#include <string>
#include <vector>

#include <gtest/gtest.h>

#include "failingCalls.h"
#include "support/streams.h"
#include "tav/tav.h"

namespace faults
{

/// A step that failed.
struct Failure
{
  const char* step;
  uint32_t code;
};

class Steps
{
public:
  /// Faults count only where a scenario is `watched`, not where it is prepared.
  explicit Steps(bool watching = true)
      : watching_(watching)
  {
    failures.reserve(8);
  }

  /// Runs a call; when it fails, once more on the healthy system. The last code.
  template<class Call>
  uint32_t call(const char* step, Call&& call)
  {
    uint32_t rc = watched(step, call);
    if (rc != TAV_RC_OK)
    {
      failures.push_back({step, rc});
      rc = watched(step, call);
    }
    EXPECT_EQ(rc, TAV_RC_OK) << step << ": the second attempt, on a healthy system: " << korCodeName(rc);
    return rc;
  }

  /// A call without a code.
  template<class Call>
  void run(const char* step, Call&& call)
  {
    watched(step, [&] {
      call();
      return TAV_RC_OK;
    });
  }

  std::vector<Failure> failures;
  const char* faultIn = nullptr; ///< the step that met the fault

private:
  template<class Call>
  uint32_t watched(const char* step, Call&& call)
  {
    Calls& calls = *failingCalls();
    const bool before = calls.happened;
    calls.watching = watching_;
    const uint32_t rc = call();
    calls.watching = false;
    if (calls.happened && !before)
    {
      faultIn = step;
    }
    return rc;
  }

  bool watching_;
};

} // namespace faults

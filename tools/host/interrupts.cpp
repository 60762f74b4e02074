#include "tools/host/interrupts.h"

#include <csignal>

#include "tools/host/host.h"

namespace tav::host
{
namespace
{
// What a signal's handler may look at.
volatile std::sig_atomic_t held = 0;
volatile std::sig_atomic_t waiting = 0; ///< the number of a signal that came while it was held

volatile std::sig_atomic_t catching = 0;
volatile std::sig_atomic_t caught = 0;
} // namespace

bool endsNow(int number)
{
  if (catching != 0 && number == SIGINT)
  {
    caught = 1;
    return false;
  }
  if (held != 0)
  {
    waiting = number;
    return false;
  }
  return true;
}

HeldInterrupts::HeldInterrupts()
{
  held = 1;
}

HeldInterrupts::~HeldInterrupts()
{
  held = 0;
  if (waiting != 0)
  {
    endBySignal(waiting);
  }
}

CaughtInterrupt::CaughtInterrupt()
{
  caught = 0;
  catching = 1;
}

CaughtInterrupt::~CaughtInterrupt()
{
  catching = 0;
}

bool CaughtInterrupt::hasCome()
{
  return caught != 0;
}
} // namespace tav::host

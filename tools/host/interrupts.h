/// @file interrupts.h
/// What the handler of a signal asks before it ends the program.
#pragma once

namespace tav::host
{
/// Whether a signal ends the program now. One that a CaughtInterrupt waits for is noted there; another one waits while
/// a HeldInterrupts lives. For handlers: it looks at flags alone.
bool endsNow(int number);

/// The handler, each platform's own: removes the files of `removeOnInterrupt`, then ends the program by the signal.
extern "C" void endBySignal(int number);
} // namespace tav::host

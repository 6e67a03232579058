// Interruption from outside: what ends a program by the user's or the system's wish (here SIGINT,
// SIGTERM and SIGHUP) becomes a mark that the work looks at now and then.
//
// For programs; a library leaves the signals of its process alone.
#ifndef ZMC_PLATFORM_INTERRUPTS_H
#define ZMC_PLATFORM_INTERRUPTS_H

namespace platform {

// From now on an interruption sets the mark; a second one of the same kind ends the process at
// once. What the process was started to ignore stays ignored. A file that grows beyond what the
// process may write fails the write, and does not end the process.
void CatchInterrupts();

// Any thread may ask.
bool IsInterrupted();

// From now on writing to a connection that the other side has ended fails, and does not end the
// process.
void IgnoreBrokenPipes();

}  // namespace platform

#endif

#pragma once

namespace tsd {

/// "tsd: TEXT" on standard error, without allocating anything.
void sayWithoutMemory(const char* text);

/// From here on a lack of memory that nobody can answer any more, in a thread of the device's or at the end of an
/// object, ends the process with a message and the exit code of a failed command. What it leaves is what a process
/// leaves that is killed. Every other such exception ends it as before, by a signal.
void endWithMessageWithoutMemory();

/// What a process of this program has to be before it does anything: see there.
void prepareProcess();

}  // namespace tsd

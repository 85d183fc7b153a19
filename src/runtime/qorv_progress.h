// Progress and operator stop through the working file.
//
// The working file's first line holds the percentage of the current step (0 to 99; -1 after a
// failure, -2 after a run with warnings), its second line the step's title. A calling program
// stops the run by writing a value above 100 into the first line.
#pragma once

/// Publishes newPercent (and the title, or the old title when null) and looks for a stop.
/// Does nothing when newPercent equals oldPercent or is 100 or more. A stop is failure 326400.
bool getAndSetPerc(int theOldPercent, int theNewPercent, const char* theTitle);

/// The usual use in a loop: call when the percentage changed, and report the stop.
/// Writes "\n EXECUTION INTERRUPTED BY OPERATOR\n" to the trace before failure 326400.
void fdfProgress(int& theLastPercent, long long theDone, long long theTotal);

/// Milliseconds slept between tries on the working file, here and in the result files
/// (1000 in a run; in-process tests shorten it).
void fdfSetProgressRetrySleepMs(int theMilliseconds);
int fdfProgressRetrySleepMs();

/// Whether an open that failed with theErrno may succeed on a later try (the calling program holds
/// the file for a moment). A file that cannot be written at all (no permission, a read-only file
/// system, a directory, a missing directory) is not retried.
bool fdfOpenFailureMayPass(int theErrno);

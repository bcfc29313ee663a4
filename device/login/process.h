// The state of the process, before anything else: it is set-id, so whoever starts it chooses its
// environment, descriptors, signals and limits.
#pragma once

#include <sys/types.h>

#include "settings.h"

namespace process {

// Settle brings signals, descriptors and file creation mask into a known state, allows no core
// dump, and starts the clock of SetDeadline.
void Settle();

// KeepPrivate lets no other process of the same user look into this one. To be called again after
// each change of ids, which undoes it.
void KeepPrivate();

// SetDeadline ends the program after so many seconds, whatever it waits for.
void SetDeadline(int seconds);

// Answered says that the program is about to write its answer: the deadline writes no other.
void Answered();

// EndNow ends the program at once, with a failure for the browser and a line in the log. It
// does not wait for a log that nobody reads. `name` is the failure's, for instance "timeout".
[[noreturn]] void EndNow(const char* name, const char* text);

// Confine gives a child process its limits of memory, processor time and file size, and lets it end
// when `parent` does.
void Confine(pid_t parent, int seconds);

// DieWithParent is the last part of Confine. Each change of ids undoes it.
void DieWithParent(pid_t parent);

// SetProxy passes the proxy of the settings to libcurl. Its only way in from outside the library is
// the environment, which holds nothing else by then.
void SetProxy(const Settings& settings);

}  // namespace process

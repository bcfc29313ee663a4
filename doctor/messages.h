// What the library throws and logs, and what to do about it. The one source for the doctor and for
// docs/messages.md.
#pragma once

#include "doctor/codes.h"

namespace doctor {

// The tables of docs/messages.md.
enum class MessageGroup {
  kBefore,
  kTokenEndpoint,
  kIdToken,
  kUser,
  kProgram,
  kLog,
  kGuard,
  kOther
};

inline constexpr char kAnchored[] = "^";

struct Message {
  MessageGroup group;
  const char* text;  // as it is in the library, with its %s; of kOther, what is always the same
  const char*
      where;  // exceptions: the class; log lines: the unit; kGuard: the priority; else: whose
  const char* cause;
  const char* remedy;
  // How it is recognised: nullptr, by `text` up to its first "%"; kAnchored, by the same, but only
  // where the library puts it, because other programs use it too; "", never; else by this regular
  // expression.
  const char* pattern = nullptr;
  const char* shown = nullptr;  // how the document shows it, if not as `text`
};

Rows<Message> Messages();

}  // namespace doctor

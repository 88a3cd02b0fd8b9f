// Texts that are put into a statement unescaped, between apostrophes.
#ifndef SCHED_DB_TEXT_H
#define SCHED_DB_TEXT_H

#include "sched_text.h"

using Statement = BoundedText<4096>;
using Refusal = BoundedText<4096 + 32>;  // may quote a word as long as a statement

// SQLite's message when another process has locked the database.
inline constexpr char kLocked[] = "database is locked";

// What may follow when a text ends the literal that it is put into.
enum class AfterText {
  kNothing,    // in a statement that writes
  kCondition,  // in one that reads: "' OR app='other"
};

// Whether the statement must not reach SQLite because of the text in it; the reason is worded like
// SQLite's.
bool isRefused(const char *szText, AfterText after, Refusal *pReason);

#endif

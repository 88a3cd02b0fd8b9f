// Texts that stand in a statement as they are, between apostrophes.
#ifndef SCHED_DB_TEXT_H
#define SCHED_DB_TEXT_H

#include "sched_text.h"

using Statement = BoundedText<4096>;
using Refusal = BoundedText<4096 + 32>;  // may name a word as long as a statement

// By these words in an error SQLite says that another process has the database.
inline constexpr char kLocked[] = "database is locked";

// What may follow when a text ends the apostrophes that it stands in.
enum class AfterText {
  kNothing,    // in a statement that writes
  kCondition,  // in one that reads: "' OR app='other"
};

// Whether the statement must not reach SQLite because of the text in it; the reason is worded as
// SQLite would.
bool isRefused(const char *szText, AfterText after, Refusal *pReason);

#endif

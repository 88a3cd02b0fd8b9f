// An application's name comes from whoever made the task, and is put into statements with its
// apostrophes unescaped. The limits and the authorizer of the connection are the caller's, so a
// text that would change the statement is refused before SQLite sees it, by its tokens outside of
// apostrophes.
//
// No semicolon, comma, parenthesis, comment or quoted identifier is allowed there. So it remains
// one statement with the same values and the same end, without function calls, tables and
// subqueries of the text's.
#include "sched_db_text.h"

#include <strings.h>

#include <algorithm>
#include <cctype>
#include <cstring>
#include <string_view>

namespace {

constexpr std::string_view kQueryWords[] = {"select", "values", "with"};
constexpr std::string_view kConditionWords[] = {"and",     "app",         "comment",   "is",
                                                "not",     "null",        "or",        "pid",
                                                "task_id", "status_code", "status_id", "timestamp"};
constexpr char kConditionOperators[] = "<=>!|";
constexpr int kMostTokens = 64;  // each is evaluated for every row

// A character of a name or a number; SQLite takes every byte that is not ASCII for a letter.
bool isOfWord(char c) {
  const auto byte = static_cast<unsigned char>(c);
  return byte >= 0x80 || isalnum(byte) != 0 || c == '_' || c == '$';
}

bool isSpace(char c) {
  return c == ' ' || (c >= '\t' && c <= '\r');
}

template <size_t N>
bool isOneOf(const std::string_view (&words)[N], std::string_view word) {
  return std::any_of(std::begin(words), std::end(words), [&](std::string_view known) {
    return known.size() == word.size() && strncasecmp(known.data(), word.data(), word.size()) == 0;
  });
}

bool isNumber(std::string_view word) {
  return std::all_of(word.begin(), word.end(), [](char c) { return c >= '0' && c <= '9'; });
}

// Past the apostrophe that ends it, or the end of the text. A last apostrophe forms a pair with
// the one that follows in the statement.
const char *endOfQuoted(const char *szQuoted) {
  for (const char *end = strchr(szQuoted, '\''); end != nullptr; end = strchr(end + 2, '\'')) {
    if (end[1] == '\0') {
      break;
    }
    if (end[1] != '\'') {
      return end + 1;
    }
  }
  return szQuoted + strlen(szQuoted);
}

const char *endOfToken(const char *szToken) {
  if (*szToken == '\'') {
    return endOfQuoted(szToken + 1);
  }
  return isOfWord(*szToken) ? std::find_if_not(szToken, szToken + strlen(szToken), isOfWord)
                            : szToken + 1;
}

bool isAllowed(std::string_view token, AfterText after) {
  const char first = token.front();
  if (first == '\'') {
    return true;
  }
  if (after == AfterText::kNothing) {
    return false;
  }
  return isOfWord(first) ? isNumber(token) || isOneOf(kConditionWords, token)
                         : strchr(kConditionOperators, first) != nullptr;
}

bool isUnknownWord(std::string_view token) {
  return isOfWord(token.front()) && !isOneOf(kQueryWords, token);
}

}  // namespace

// Where the text ends outside of apostrophes, the statement's own begins an unterminated literal,
// which SQLite refuses. Its message quotes the text, which must therefore not contain the words by
// which execute() recognises a locked database and tries again.
bool isRefused(const char *szText, AfterText after, Refusal *pReason) {
  if (strchr(szText, '\'') != nullptr && strstr(szText, kLocked) != nullptr) {
    pReason->append("not authorized");
    return true;
  }
  int tokens = 0;
  for (const char *next = endOfQuoted(szText); *next != '\0';) {
    if (isSpace(*next)) {
      ++next;
      continue;
    }
    const char *const end = endOfToken(next);
    const std::string_view token(next, static_cast<size_t>(end - next));
    const bool isTooMuch = ++tokens > kMostTokens;
    if (isTooMuch || !isAllowed(token, after)) {
      if (!isTooMuch && isUnknownWord(token)) {
        pReason->append("near \"%.*s\": syntax error", static_cast<int>(token.size()), next);
      } else {
        pReason->append("not authorized");
      }
      return true;
    }
    next = end;
  }
  return false;
}

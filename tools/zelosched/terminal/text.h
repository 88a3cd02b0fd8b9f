// Text for people: what is safe to print, and how wide it is.
#pragma once

#include <string>
#include <string_view>
#include <vector>

// The text with everything escaped that a terminal would interpret or not show: control characters
// (\n, \t, \x1b, ...), marks of writing direction, invisible characters, and invalid UTF-8.
std::string printable(std::string_view text);

// The same of several lines: line feeds and tabs stay.
std::string printableLines(std::string_view text);

// The text without blanks, tabs and carriage returns at its ends.
std::string_view trimmed(std::string_view text);

// The bytes at the end of a text that begin a character whose rest may follow; 0 when there are
// none.
size_t cutCharacterLength(std::string_view text);

// Columns that a printable text takes.
size_t widthOf(std::string_view printable);

// The text, cut to so many columns where it is wider, which an ellipsis shows.
std::string fitted(const std::string &printable, size_t columns);

// The text in lines of at most so many columns, at its blanks where it has them; one at least.
std::vector<std::string> wrapped(const std::string &printable, size_t columns);

// "word", or its plural for every number but one.
std::string counted(size_t number, const char *word);

// The word quoted for a shell, where that is needed.
std::string shellQuoted(std::string_view word);

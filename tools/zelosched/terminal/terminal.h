// What the standard output is, and what it can show.
#pragma once

#include <cstddef>
#include <optional>

bool isTerminal();

// Columns of the terminal; nothing when the output is none, and lines may be of any length.
std::optional<size_t> terminalColumns();

// Colours are for terminals, and not where NO_COLOR or a dumb terminal asks for none.
bool showsColour();

// A terminal takes characters beyond ASCII in a UTF-8 locale only. A file or a pipe takes them all.
bool showsUnicode();

// A table of aligned columns. On a terminal, columns that may shrink do so until a line fits: a
// text that is too long is cut, or wrapped.
#pragma once

#include <string>
#include <vector>

// In a cell, where there is nothing to tell.
inline constexpr char kNoValue[] = "-";

struct Column {
  const char *title;
  enum Alignment { kLeft, kRight } alignment = kLeft;
  bool shrinks = false;
  bool wraps = false;  // of one that shrinks: a text is wrapped instead of cut
};

enum class Emphasis { kNone, kDim, kBad };

struct Cell {
  std::string text;  // made printable by the table
  Emphasis emphasis = Emphasis::kNone;
};

class Table {
 public:
  explicit Table(std::vector<Column> columns);

  void add(std::vector<Cell> row);
  bool empty() const { return rows_.empty(); }
  // The whole table as text, within so many columns (0: any number).
  std::string text(size_t columns, bool colour) const;
  // To the standard output, within the width of the terminal.
  void print() const;

 private:
  std::vector<Column> columns_;
  std::vector<std::vector<Cell>> rows_;
};

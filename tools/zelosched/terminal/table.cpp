#include "terminal/table.h"

#include <algorithm>
#include <cstdio>
#include <numeric>

#include "terminal/terminal.h"
#include "terminal/text.h"

namespace {

constexpr size_t kGap = 2;
constexpr size_t kNarrowest = 8;  // a narrower name could not be recognised

const char *const kStart[] = {"", "\033[2m", "\033[31m"};
constexpr char kEnd[] = "\033[0m";

using Widths = std::vector<size_t>;

size_t lineWidth(const Widths &widths) {
  return std::accumulate(widths.begin(), widths.end(), size_t{0}) + kGap * (widths.size() - 1);
}

// The widest column that may and can still shrink, or none.
size_t nextToShrink(const std::vector<Column> &columns, const Widths &widths) {
  size_t widest = widths.size();
  for (size_t i = 0; i < widths.size(); ++i) {
    const size_t floor = std::max(kNarrowest, widthOf(columns[i].title));
    const bool can = columns[i].shrinks && widths[i] > floor;
    if (can && (widest == widths.size() || widths[i] > widths[widest])) widest = i;
  }
  return widest;
}

void shrink(const std::vector<Column> &columns, size_t most, Widths *widths) {
  while (lineWidth(*widths) > most) {
    const size_t column = nextToShrink(columns, *widths);
    if (column == widths->size()) return;
    --(*widths)[column];
  }
}

std::string emphasised(const std::string &text, Emphasis emphasis, bool colour) {
  if (!colour || emphasis == Emphasis::kNone) return text;
  return kStart[static_cast<size_t>(emphasis)] + text + kEnd;
}

// The text of a cell, line by line.
std::vector<std::string> linesOf(const Column &column, const std::string &text, size_t width) {
  return column.wraps ? wrapped(text, width) : std::vector<std::string>{fitted(text, width)};
}

void appendText(std::string *line, const Column &column, const std::string &text, Emphasis emphasis,
                size_t width, bool colour) {
  const std::string padding(width - std::min(width, widthOf(text)), ' ');
  if (column.alignment == Column::kRight) *line += padding;
  *line += emphasised(text, emphasis, colour);
  if (column.alignment == Column::kLeft) *line += padding;
  *line += std::string(kGap, ' ');
}

void dropBlanksAtEnd(std::string *line) {
  line->resize(line->find_last_not_of(' ') + 1);
}

// As many lines as the cell that takes most.
std::string rowText(const std::vector<Column> &columns, const std::vector<Cell> &row,
                    const Widths &widths, bool colour) {
  std::vector<std::vector<std::string>> cells;
  size_t height = 1;
  for (size_t i = 0; i < row.size(); ++i) {
    cells.push_back(linesOf(columns[i], row[i].text, widths[i]));
    height = std::max(height, cells.back().size());
  }
  std::string out;
  for (size_t n = 0; n < height; ++n) {
    std::string line;
    for (size_t i = 0; i < row.size(); ++i) {
      const bool isThere = n < cells[i].size() && !cells[i][n].empty();
      appendText(&line, columns[i], isThere ? cells[i][n] : "",
                 isThere ? row[i].emphasis : Emphasis::kNone, widths[i], colour);
    }
    dropBlanksAtEnd(&line);
    out += line + '\n';
  }
  return out;
}

}  // namespace

Table::Table(std::vector<Column> columns) : columns_(std::move(columns)) {}

void Table::add(std::vector<Cell> row) {
  for (Cell &cell : row) cell.text = printable(cell.text);
  rows_.push_back(std::move(row));
}

std::string Table::text(size_t columns, bool colour) const {
  std::vector<Cell> titles;
  Widths widths;
  for (const Column &column : columns_) {
    titles.push_back({column.title});
    widths.push_back(widthOf(column.title));
  }
  for (const std::vector<Cell> &row : rows_) {
    for (size_t i = 0; i < row.size(); ++i) {
      widths[i] = std::max(widths[i], widthOf(row[i].text));
    }
  }
  if (columns > 0) shrink(columns_, columns, &widths);

  std::string out = rowText(columns_, titles, widths, colour);
  for (const std::vector<Cell> &row : rows_) out += rowText(columns_, row, widths, colour);
  return out;
}

void Table::print() const {
  const std::string whole = text(terminalColumns().value_or(0), showsColour());
  std::fwrite(whole.data(), 1, whole.size(), stdout);
}

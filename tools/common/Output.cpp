#include "tools/common/Output.h"

#include <errno.h>
#include <stdio.h>
#include <string.h>

#include <algorithm>
#include <utility>

#include "tools/common/Progress.h"

namespace vltctl {
namespace {

std::string Dump(const Json& value) {
  return value.dump(-1, ' ', false, Json::error_handler_t::replace);
}

void Write(std::string_view text) {
  ClearProgress();
  fwrite(text.data(), 1, text.size(), stdout);
}

Json OrNull(const std::string& text) { return text.empty() ? Json() : Json(text); }

}  // namespace

std::string TextOf(const Problem& problem) {
  std::string out;
  for (const std::string* part : {&problem.where, &problem.what, &problem.why}) {
    if (!part->empty()) out += (out.empty() ? "" : ": ") + *part;
  }
  return problem.next.empty() ? out : out + "; " + problem.next;
}

void Table::add(std::vector<std::string> cells, Mood mood) {
  Row row{{}, mood};
  for (const std::string& cell : cells) {
    std::string text = ForTerminal(cell);
    size_t width = DisplayWidth(text);
    row.cells.push_back({std::move(text), width});
  }
  m_rows.push_back(std::move(row));
}

std::string Table::text() const {
  std::vector<size_t> widths;
  for (const auto& [cells, mood] : m_rows) {
    widths.resize(std::max(widths.size(), cells.size()));
    for (size_t i = 0; i < cells.size(); ++i) widths[i] = std::max(widths[i], cells[i].width);
  }
  std::string out;
  for (const auto& [cells, mood] : m_rows) {
    for (size_t i = 0; i < cells.size(); ++i) {
      out += Coloured(cells[i].text, i == 0 ? mood : Mood::Plain);
      out.append(widths[i] - cells[i].width + 2, ' ');
    }
    out.erase(out.find_last_not_of(' ') + 1);
    out += "\n";
  }
  return out;
}

void Output::begin() {
  if (m_begun) return;
  m_begun = true;
  Write("{\"schema\": \"vltctl/1\", \"command\": " + Dump(OrNull(m_command)) + ", \"items\": [");
}

void Output::item(const Json& item) {
  if (!m_json) return;
  begin();
  Write((m_hasItems ? ",\n" : "\n") + Dump(item));
  m_hasItems = true;
  fflush(stdout);
}

void Output::line(std::string_view text) {
  if (m_json) return;
  Write(ForTerminal(text) + "\n");
}

void Output::line(std::string_view before, std::string_view word, Mood mood,
                  std::string_view after) {
  if (m_json) return;
  Write(ForTerminal(before) + Coloured(ForTerminal(word), mood) + ForTerminal(after) + "\n");
}

void Output::print(const Table& table) {
  if (!m_json) Write(table.text());
}

void Output::raw(std::string_view text) {
  if (!m_json) Write(text);
}

void Output::flush() { fflush(stdout); }

void Output::note(std::string_view text) {
  ClearProgress();
  fflush(stdout);
  fprintf(stderr, "vltctl: %s\n", ForTerminal(text).c_str());
}

void Output::problem(const Problem& given) {
  Problem problem = given;
  problem.next = remedy(problem.next);
  note(TextOf(problem));
  m_problems.push_back({{"code", problem.code},
                        {"where", OrNull(problem.where)},
                        {"what", problem.what},
                        {"why", OrNull(problem.why)},
                        {"next", OrNull(problem.next)}});
}

int Output::finish(int code) {
  if (m_json) {
    begin();
    Write((m_hasItems ? "\n], \"problems\": " : "], \"problems\": ") + Dump(m_problems) + "}\n");
  }
  errno = 0;
  bool failed = fflush(stdout) != 0;
  int error = errno;
  if (!failed && !ferror(stdout)) return code;
  // An earlier flush has seen the cause; it is asked for again.
  if (!error && fputc('\n', stdout) != EOF && fflush(stdout) != 0) error = errno;
  if (error != EPIPE) {
    fprintf(stderr, "vltctl: standard output: cannot be written: %s; the output is incomplete\n",
            error ? strerror(error) : "an earlier write failed");
  }
  return kCannotWrite;
}

}  // namespace vltctl

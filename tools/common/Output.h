#pragma once

#include <stddef.h>

#include <exception>
#include <nlohmann/json.hpp>
#include <string>
#include <string_view>
#include <utility>
#include <vector>

#include "tools/common/Commands.h"
#include "tools/common/Remedy.h"
#include "tools/common/Terminal.h"

// What a command prints: text for people or, with --json, one document for programs:
//
//   {"schema": "vltctl/1", "command": "verify", "items": [...], "problems": [...]}
//
// Each item is an object of the command's own shape; tools/vltctl-1.schema.json describes all of them.
// Numbers are numbers, and what is not there is null. It is one document on failure, too.
namespace vltctl {

using Json = nlohmann::ordered_json;

// Why a command could not do what it was asked: where, what, why, and what to do. The parts are text
// without a full stop; an empty one is left out. `code` is for programs and never changes.
struct Problem {
  std::string code, where, what, why, next;
};

// "where: what: why; next".
std::string TextOf(const Problem& problem);

// Ends the command with the code; Run (Program.h) reports it.
struct Failure : std::exception {
  Failure(ExitCode exitCode, Problem p) : code(exitCode), problem(std::move(p)) {}
  const char* what() const noexcept override { return problem.what.c_str(); }
  ExitCode code;
  Problem problem;
};

// Rows that are aligned by what a terminal shows of them, without blanks at the ends of lines.
class Table {
 public:
  Table() = default;
  explicit Table(std::vector<std::string> header) { add(std::move(header)); }
  // Cells are made safe for the terminal. The first one is shown in the colour of the mood.
  void add(std::vector<std::string> cells, Mood mood = Mood::Plain);
  // Lines with their ends.
  std::string text() const;

 private:
  struct Cell {
    std::string text;
    size_t width;
  };
  struct Row {
    std::vector<Cell> cells;
    Mood mood;
  };
  std::vector<Row> m_rows;
};

// The output of one command. With --json, text is not printed; without, items are not.
class Output {
 public:
  // `root` is the value of --root; empty without it.
  Output(std::string command, bool json, std::string root = "")
      : m_command(std::move(command)), m_json(json), m_root(std::move(root)) {}
  Output(const Output&) = delete;
  Output& operator=(const Output&) = delete;

  bool json() const { return m_json; }

  // What to do, for the installation of the command (Remedy.h). Problems are given theirs here.
  std::string remedy(const std::string& text) const { return RemedyAt(m_root, text); }

  // One element of "items", printed at once. JSON demands UTF-8; what a file holds beyond it is shown
  // as the replacement character.
  void item(const Json& item);
  // One line of text, which is made safe for the terminal.
  void line(std::string_view text);
  // The same, of three parts, the middle one in the colour of the mood.
  void line(std::string_view before, std::string_view word, Mood mood, std::string_view after);
  void print(const Table& table);
  // Text that is printed as it is: scripts.
  void raw(std::string_view text);

  // Writes what was printed so far: the rest may take a while.
  void flush();

  // On standard error, in both forms, as one line.
  void note(std::string_view text);
  // The same, and one element of "problems".
  void problem(const Problem& problem);

  // Completes the document and writes what is still held. Returns the code, or kCannotWrite if the
  // output could not be written; that is reported unless the reader has gone.
  int finish(int code);

 private:
  void begin();

  const std::string m_command;
  const bool m_json;
  const std::string m_root;
  bool m_begun = false, m_hasItems = false;
  Json m_problems = Json::array();
};

}  // namespace vltctl

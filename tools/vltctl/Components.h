#pragma once

#include <functional>
#include <string>
#include <vector>

#include "source/Snapshot/snapshot.hpp"
#include "tools/common/Arguments.h"
#include "tools/common/Output.h"

// Components as the snapshot reader finds them (source/Snapshot/snapshot.hpp): what list, show,
// classes, scan and why have in common.
namespace admin {

using vlt::snapshot::Component;
using vlt::snapshot::Snapshot;
using vltctl::Arguments;
using vltctl::Output;

// Of the installation in force, or of --root. Throws vltctl::Failure.
Snapshot ReadSnapshot();
// The same, but a database that has no components to show is a failure, too. What the components do
// not say is noted: a tree that has changed since, a digest that differs.
Snapshot ReadComponents(Output& output);

// What the next start of a registrar would do there. Throws vltctl::Failure.
vlt::snapshot::Start Rehearse();

// Runs a step of the reader; what it throws becomes a vltctl::Failure.
void WithFailures(const std::function<void()>& step);

// Notes the directories that could not be read.
void NoteProblems(const std::vector<vlt::snapshot::Problem>& problems, Output& output);

vltctl::Json ToJson(const Component& component);

// The components that a text of the command line means: a GUID or a name, or the beginning of one,
// or a path of the component's file or registration file. An exact match counts alone.
std::vector<const Component*> Matches(const Snapshot& snapshot, const std::string& text);

// The one component. Throws vltctl::Failure with kNotFound for none and for several.
const Component& Only(const Snapshot& snapshot, const std::string& text);

// "dictionary", "object-expert", "resource-expert"; false for other words.
bool IsTypeWord(const std::string& word);
std::string TypeWord(vlt::snapshot::Type type);

// "unchanged", "new", "changed", "vanished".
const char* WordOf(vlt::snapshot::FileState state);

// The component's file where it lies now: that of an image may be recorded elsewhere. Empty if it has
// none.
std::string FileOf(const Snapshot& snapshot, const Component& component);

// Whether the path means a file of the installation's own machine: not one outside of an image.
bool IsHere(const std::string& file);

// The code of a component's bundle, as the library looks for it; empty if there is none. A file is
// its own code. One outside of an image is another machine's, and has none here.
std::string LibraryOf(const std::string& file);

// "1 file", "2 files".
std::string Plural(unsigned count, const std::string& what);

// For --live: waits, for at most --wait seconds, until no other process has the registrar. Throws
// vltctl::Failure with kBusy. A process that takes it right after that is waited for by the library.
void WaitForRegistrar(const Arguments& arguments);

}  // namespace admin

#pragma once

#include <string>
#include <string_view>

// Text from files and arguments, made safe for a terminal.
namespace vltctl {

// The text, in the encoding of the process's locale, with everything that a terminal obeys in place of
// showing it escaped: control characters below 0x80, line feeds among them, and bytes that are no
// character of the locale as \xNN; C1 controls (U+0080 to U+009F), line separators and the controls
// that change the direction of writing as \u{NN}. Other characters, a backslash too, stay as they are.
std::string ForTerminal(std::string_view text);

// Columns that a terminal needs for a text that ForTerminal has returned: two for wide characters, none
// for those that combine with the one before.
size_t DisplayWidth(std::string_view text);

// What a word is like, which a terminal shows in green, yellow or red.
enum class Mood { Plain, Good, Doubtful, Bad };

// Whether standard output shows colours: a terminal does, unless NO_COLOR is set; CLICOLOR_FORCE makes
// everything do.
bool ShowsColours();

// The text in the colour of the mood, where colours are shown.
std::string Coloured(std::string_view text, Mood mood);

}  // namespace vltctl

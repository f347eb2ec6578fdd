// What MakeModule() copies (tests/support/Modules.h).
extern "C" [[gnu::visibility("default")]] double cos(double angle) { return angle == 0 ? 1 : 0; }

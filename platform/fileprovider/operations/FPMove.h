#pragma once

#include <string>

namespace droxa {

// Gives the item at `from` the path `to` in one step, on one file system, and never over something else.
// 0, or the system's error: EEXIST where `to` is taken, EXDEV for another file system. A name that differs
// from the old one for the file system's eyes only in case is no collision. The caller coordinates both.
int FPMove(const std::string &from, const std::string &to);
// The same from one open folder to another.
int FPMoveAt(int fromFolder, const std::string &from, int toFolder, const std::string &to);

}  // namespace droxa

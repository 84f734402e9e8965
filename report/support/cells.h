// Texts on a terminal: how many cells they take, and how they look without what could steer it. A small table of our
// own, so that the result is the same in every locale.
#pragma once

#include <cstddef>
#include <cstdint>
#include <string>
#include <string_view>

namespace report {

// The next character of a text, which must not be empty. What is no UTF-8 comes as one byte with *valid false.
uint32_t NextCharacter(std::string_view text, size_t *length, bool *valid);
// A character that moves a cursor, hides text or turns its direction: control characters and marks of direction.
bool IsControl(uint32_t character);
// Appends a text with control characters and bytes that are no UTF-8 written as \xNN or \u{NNNN}, so that nothing in
// it can steer a terminal.
void AppendClean(std::string *out, std::string_view text);
// Cells that a clean text takes: 2 for wide East Asian characters and emoji, 0 for combining ones.
size_t CellsOf(std::string_view text);
// The longest head of a clean text that takes so many cells at most.
std::string_view CutToCells(std::string_view text, size_t cells);

}  // namespace report

// The rules for arguments, written a second time to compare with the stores.

#pragma once

#include <cstddef>
#include <cstdint>
#include <string>
#include <vector>

bool hasNul(const std::string& value);
// The value up to its first NUL byte.
std::string untilNul(const std::string& value);
// The same with every single quote doubled: what a store keeps of a value that it quotes.
std::string doubled(const std::string& value);
// SQLite's error for the first of these values that holds a NUL byte; "" if none does. The values
// stand in the statement as given and in this order.
std::string refusalOf(const std::vector<std::string>& values);
// Whether the text is min to max bytes long.
bool fits(const std::string& text, std::size_t min, std::size_t max);
// An address of either family, as the C library reads them.
bool isAddress(const std::string& text);
// Decimal text as a number, the nearest one if it is out of range; 0 for any other text.
std::int64_t number(const std::string& text);

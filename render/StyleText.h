// StyleText: values of a style's keys as texts, one reader and one writer for each form.
//
// Readers throw StyleError for the key that they are told, with what is wrong in one line.
#ifndef ZMC_RENDER_STYLETEXT_H
#define ZMC_RENDER_STYLETEXT_H

#include <string>
#include <string_view>
#include <vector>

#include "render/Style.h"

namespace zmcrender {

// A part of a value as messages show it: cut, in quotes, without control characters.
std::string Quoted(std::string_view text);
// The parts between separators: one more than there are separators.
std::vector<std::string_view> SplitAt(std::string_view text, char separator);

Number ReadNumber(const char* key, std::string_view text);
// The same within closed bounds.
double ReadReal(const char* key, std::string_view text, double least, double most);
bool ReadSwitch(const char* key, std::string_view text);
std::vector<std::uint32_t> ReadBands(std::string_view text);
Stretch ReadStretch(std::string_view text);
NoDataChoice ReadNoData(std::string_view text);
std::string ReadColormapName(std::string_view text);
ComplexPart ReadComplexPart(std::string_view text);

std::string TextOf(double number);
std::string TextOf(const std::vector<std::uint32_t>& bands);
std::string TextOf(const Stretch& stretch);
std::string TextOf(const NoDataChoice& choice);
std::string TextOf(ComplexPart part);

}  // namespace zmcrender

#endif

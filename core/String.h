// String: the text type of the object model.
//
// 16-bit code units, zero-terminated, with two narrow forms of the same text made on demand and
// dropped when the text changes. A value type: every object owns its buffers. A string without a
// buffer (null) and one whose buffer holds only the terminator (empty) are different states that
// only comparison tells apart.
//
// Nothing here throws: an allocation that fails shows as a null or empty text. There is no lock,
// and GetUtf8 and GetAnsi fill caches, so even reading one String from two threads needs care.
#ifndef ZMC_CORE_STRING_H
#define ZMC_CORE_STRING_H

#include <cstdint>
#include <iosfwd>
#include <string>
#include <string_view>

#include "core/WideChar.h"

namespace zelm {

class String {
public:
    // Answer of Find for "not there".
    static constexpr std::uint32_t kNotFound = 4294967295u;

    WideChar* wide = nullptr;      // the text, owned; null in a string without a buffer
    mutable char* ansi = nullptr;  // cached form in the locale's charset, owned; null until asked
    mutable char* utf8 = nullptr;  // cached UTF-8 form, owned; null until asked for
    // Units of the text when made from wide text; bytes of the source when made from narrow text,
    // which is more than the units of text outside ASCII. Only the terminator tells the true end.
    std::uint32_t length = 0;

    String() = default;
    String(const WideChar* text);  // null gives the null state
    String(const char* utf8Text);  // null gives the null state
    // Text and length, not the caches; the length also where the text is null, as it is where
    // memory ran out for narrow text.
    String(const String& other);
    ~String();

    // Assigning a string to itself leaves it null: the buffer is freed before it is read.
    String& operator=(const String& other);
    String& operator=(const WideChar* text);
    String& operator=(const char* utf8Text);
    String& operator=(const std::string& utf8Text);  // an empty text gives the null state

    // Narrow forms, owned by this object and good until its text changes; null if `wide` is null
    // or memory ran out.
    const char* GetUtf8() const;
    const char* GetAnsi() const;

    String& Append(const String& other);
    String& operator+=(const String& other) { return Append(other); }

    // Writes `count` units from `start` into `out`, which may be this string itself. A count of 0,
    // or one that runs over the end, means up to the end; a start behind the end gives the empty
    // text. Where memory runs out, `out` is null.
    void Substring(std::uint32_t start, std::uint32_t count, String& out) const;

    // Folds the text in place, unit by unit.
    void ToLower();

    // Difference of the first pair of units that differ, 0 if there is none. A null buffer comes
    // before every other text, the empty one included.
    int Compare(const String& other) const;

    // Index of the first occurrence, or kNotFound; a null buffer on either side is not found.
    std::uint32_t Find(const String& needle) const;

    // The text up to its terminator; empty for a null buffer. Valid until the text changes.
    std::basic_string_view<WideChar> View() const;

    // Exchanges texts, lengths and caches.
    void Swap(String& other) noexcept;

    bool IsEmpty() const { return length == 0; }

private:
    void CopyOf(const String& other);
    void Free();
    void FreeCaches() const;
    void CopyUnits(const WideChar* text, std::size_t units);
    void ConvertFromUtf8(const char* text, std::size_t bytes);
};

// Null where memory runs out.
String operator+(const String& a, const String& b);

inline bool operator==(const String& a, const String& b) { return a.Compare(b) == 0; }
inline bool operator<(const String& a, const String& b) { return a.Compare(b) < 0; }
// Compares with UTF-8 text; null counts as a null buffer.
bool operator==(const String& a, const char* b);

// Reads one token that white space delimits, trims " \r\n\t" at both ends, and assigns it, to a
// String up to the first zero; an exhausted stream gives the null state, and the empty narrow text.
// A short narrow token takes no memory, so that a known word is not lost for want of it.
void ReadTrimmedToken(std::istream& stream, std::string& out);
void ReadTrimmedToken(std::istream& stream, String& out);

}  // namespace zelm

#endif

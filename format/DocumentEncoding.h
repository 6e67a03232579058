// DocumentEncoding: documents in UTF-8, whatever encoding they declare.
//
// Whoever looks at the bytes of a text ahead of the parser has to read from them what the parser
// will. In the encodings that are left as they are, a byte that is a sign of ASCII stands for that
// sign and for nothing else. Elsewhere it may be half of another sign, or the sign be written in
// other bytes: such texts are put into UTF-8 by the parser's own tables. Xerces-C++ has been
// started.
#ifndef ZMC_FORMAT_DOCUMENTENCODING_H
#define ZMC_FORMAT_DOCUMENTENCODING_H

#include <cstddef>
#include <memory>
#include <string_view>

namespace zelm {

struct Utf8Document {
    std::unique_ptr<unsigned char[]> bytes;  // null: the text is to be read as it is
    std::size_t size = 0;
};

// The document in UTF-8, which it then declares, where it is in an encoding that hides signs. What
// is no text in its encoding becomes a character that no parser accepts; an encoding that nobody
// knows is left for the parser to refuse. Takes time and memory in proportion to the text. Throws
// std::bad_alloc.
Utf8Document ToUtf8(const unsigned char* text, std::size_t size);

// Whether a text that declares an encoding by that name is read as it is.
bool IsPlainEncoding(std::u16string_view name);

}  // namespace zelm

#endif

#include "format/DocumentEncoding.h"

#include <algorithm>
#include <cstring>
#include <new>
#include <string>
#include <vector>

#include <xercesc/framework/XMLRecognizer.hpp>
#include <xercesc/util/OutOfMemoryException.hpp>
#include <xercesc/util/PlatformUtils.hpp>
#include <xercesc/util/TransService.hpp>
#include <xercesc/util/XMLEBCDICTranscoder.hpp>
#include <xercesc/util/XMLException.hpp>
#include <xercesc/util/XMLUni.hpp>

#include "format/XercesText.h"

namespace zelm {
namespace {

using xercesc::XMLRecognizer;
using xercesc::XMLUni;

constexpr std::string_view kBlanks = " \t\r\n";
constexpr std::string_view kUtf8 = "UTF-8";
constexpr XMLSize_t kPiece = 16384;  // characters that a transcoder is asked for at once
constexpr unsigned char kRefused = 1;

// The declaration that a document begins with.
struct Declaration {
    std::string text;        // in ASCII, from its first to its last sign; empty: none
    std::size_t offset = 0;  // of its first byte
    bool isEbcdic = false;   // its bytes are
    bool comesLate = false;  // the parser has taken the text for UTF-8 before it sees it

    std::size_t End() const { return offset + text.size(); }
};

bool BeginsWith(std::string_view text, const void* sign, std::size_t size) {
    return text.size() >= size && std::memcmp(text.data(), sign, size) == 0;
}

// Empty where one of the bytes is no sign of ASCII.
std::string Signs(std::string_view bytes, bool ebcdic) {
    std::string signs;
    for (const char byte : bytes) {
        const auto code = static_cast<unsigned char>(byte);
        const XMLCh sign = ebcdic ? xercesc::XMLEBCDICTranscoder::xlatThisOne(code) : XMLCh{code};
        if (sign >= 0x80) return "";
        signs += static_cast<char>(sign);
    }
    return signs;
}

// The value in a declaration, inside it; empty if it has none.
std::string_view FindEncoding(std::string_view rest) {
    rest.remove_prefix(std::min(rest.find_first_of(kBlanks), rest.size()));
    while (true) {
        rest.remove_prefix(std::min(rest.find_first_not_of(kBlanks), rest.size()));
        const std::string_view name = rest.substr(0, rest.find_first_of(" \t\r\n="));
        rest.remove_prefix(std::min(rest.find('='), rest.size()));
        rest.remove_prefix(std::min(rest.find_first_of("\"'"), rest.size()));
        if (rest.empty()) return {};
        const std::size_t end = rest.find(rest.front(), 1);
        if (end == rest.npos) return {};
        if (name == "encoding") return rest.substr(1, end - 1);
        rest.remove_prefix(end + 1);
    }
}

Declaration ReadDeclaration(std::string_view text) {
    // The parser holds no longer one.
    constexpr std::size_t kLongest = 16383;
    constexpr char kEbcdicClose = 0x6E;
    Declaration found;
    found.isEbcdic = BeginsWith(text, XMLRecognizer::fgEBCDICPre, XMLRecognizer::fgEBCDICPreLen);
    if (BeginsWith(text, XMLRecognizer::fgUTF8BOM, XMLRecognizer::fgUTF8BOMLen))
        found.offset = XMLRecognizer::fgUTF8BOMLen;
    text = text.substr(found.offset, kLongest);
    const std::size_t close = text.find(found.isEbcdic ? kEbcdicClose : '>');
    if (close == text.npos) return found;
    found.text = Signs(text.substr(0, close + 1), found.isEbcdic);
    if (!found.text.starts_with("<?xml") || found.text.find_first_of(kBlanks) != 5)
        found.text.clear();
    found.comesLate = !found.isEbcdic && !BeginsWith(found.text, XMLRecognizer::fgASCIIPre,
                                                     XMLRecognizer::fgASCIIPreLen);
    return found;
}

// As a document has to write it; tables would be found by other names too.
bool IsName(std::string_view encoding) {
    constexpr std::string_view kLetters =
        "ABCDEFGHIJKLMNOPQRSTUVWXYZabcdefghijklmnopqrstuvwxyz0123456789._-";
    return !encoding.empty() && encoding.find_first_not_of(kLetters) == encoding.npos;
}

using Transcoder = std::unique_ptr<xercesc::XMLTranscoder>;

// Null if nobody knows that encoding.
Transcoder MakeTranscoder(std::string_view encoding) {
    xercesc::XMLTransService* const service = xercesc::XMLPlatformUtils::fgTransService;
    if (!service) return nullptr;
    xercesc::XMLTransService::Codes reason{};
    return Transcoder(service->makeNewTranscoderFor(ToWide(encoding).c_str(), reason, kPiece,
                                                    xercesc::XMLPlatformUtils::fgMemoryManager));
}

// Writes UTF-8. Half a pair of units, and NUL, are nothing that a document may hold.
class Utf8Writer {
public:
    explicit Utf8Writer(std::vector<unsigned char>& target) : out(target) {}

    void Write(XMLCh unit) {
        const bool second = unit >= 0xDC00 && unit < 0xE000;
        if (first != 0 && second) {
            const char32_t code = 0x10000 + ((first - 0xD800u) << 10) + (unit - 0xDC00u);
            first = 0;
            return Append(code);
        }
        End();
        if (unit >= 0xD800 && unit < 0xDC00)
            first = unit;
        else
            Append(second || unit == 0 ? char32_t{kRefused} : char32_t{unit});
    }
    void End() {
        if (first != 0) Append(kRefused);
        first = 0;
    }

private:
    void Append(char32_t code) {
        if (code < 0x80) return Put(code);
        if (code < 0x800) {
            Put(0xC0 | code >> 6);
        } else if (code < 0x10000) {
            Put(0xE0 | code >> 12);
            Put(0x80 | (code >> 6 & 0x3F));
        } else {
            Put(0xF0 | code >> 18);
            Put(0x80 | (code >> 12 & 0x3F));
            Put(0x80 | (code >> 6 & 0x3F));
        }
        Put(0x80 | (code & 0x3F));
    }
    void Put(char32_t byte) { out.push_back(static_cast<unsigned char>(byte)); }

    std::vector<unsigned char>& out;
    XMLCh first = 0;  // of a pair
};

// What the transcoder takes nothing of is no text for the parser either.
void Transcode(xercesc::XMLTranscoder& transcoder, std::string_view text,
               std::vector<unsigned char>& out) {
    Utf8Writer writer(out);
    std::vector<XMLCh> units(kPiece);
    std::vector<unsigned char> sizes(kPiece);
    while (!text.empty()) {
        XMLSize_t eaten = 0;
        const XMLSize_t made =
            transcoder.transcodeFrom(reinterpret_cast<const XMLByte*>(text.data()), text.size(),
                                     units.data(), units.size(), eaten, sizes.data());
        std::for_each_n(units.data(), made, [&](XMLCh unit) { writer.Write(unit); });
        if (made == 0 && eaten == 0) break;
        text.remove_prefix(eaten);
    }
    writer.End();
}

// As long as before wherever that can be: what is wrong with the text is told by line and column.
std::string DeclaringUtf8(const std::string& declaration, std::string_view encoding) {
    const auto at = static_cast<std::size_t>(encoding.data() - declaration.data());
    const std::size_t length = encoding.size();
    std::string text = declaration;
    if (length > kUtf8.size()) text.insert(at + length + 1, length - kUtf8.size(), ' ');
    return text.replace(at, length, kUtf8);
}

Utf8Document Finish(const std::vector<unsigned char>& bytes) {
    Utf8Document document;
    document.bytes = std::make_unique<unsigned char[]>(bytes.size());
    document.size = bytes.size();
    std::copy(bytes.begin(), bytes.end(), document.bytes.get());
    return document;
}

Utf8Document Rewrite(const Declaration& declaration, std::string_view encoding,
                     std::string_view text) {
    Transcoder transcoder = MakeTranscoder(encoding);
    if (transcoder && declaration.comesLate) transcoder = MakeTranscoder(kUtf8);
    if (!transcoder) return {};
    const std::string front = DeclaringUtf8(declaration.text, encoding);
    std::vector<unsigned char> bytes(front.begin(), front.end());
    try {
        Transcode(*transcoder, text.substr(declaration.End()), bytes);
    } catch (const xercesc::XMLException&) {
        bytes.push_back(kRefused);
    }
    return Finish(bytes);
}

bool SameLetters(std::u16string_view a, std::u16string_view b) {
    const auto upper = [](XMLCh letter) {
        return letter >= u'a' && letter <= u'z' ? static_cast<XMLCh>(letter - u'a' + u'A') : letter;
    };
    return std::equal(a.begin(), a.end(), b.begin(), b.end(),
                      [upper](XMLCh x, XMLCh y) { return upper(x) == upper(y); });
}

}  // namespace

bool IsPlainEncoding(std::u16string_view name) {
    // The last ones have no sign of one byte: where the bytes say otherwise, the parser believes
    // them, and goes on as if nothing were declared.
    static const XMLCh* const names[] = {
        XMLUni::fgUTF8EncodingString,      XMLUni::fgUTF8EncodingString2,
        XMLUni::fgUSASCIIEncodingString,   XMLUni::fgUSASCIIEncodingString2,
        XMLUni::fgUSASCIIEncodingString3,  XMLUni::fgUSASCIIEncodingString4,
        XMLUni::fgISO88591EncodingString,  XMLUni::fgISO88591EncodingString2,
        XMLUni::fgISO88591EncodingString3, XMLUni::fgISO88591EncodingString4,
        XMLUni::fgWin1252EncodingString,   XMLUni::fgUTF16EncodingString,
        XMLUni::fgUTF16EncodingString2,    XMLUni::fgUTF16EncodingString3,
        XMLUni::fgUTF16EncodingString4,    XMLUni::fgUTF16EncodingString5,
        XMLUni::fgUTF16EncodingString6,    XMLUni::fgUTF16EncodingString7,
        XMLUni::fgUCS4EncodingString,      XMLUni::fgUCS4EncodingString2,
        XMLUni::fgUCS4EncodingString3,     XMLUni::fgUCS4EncodingString4,
        XMLUni::fgUCS4EncodingString5};
    return std::any_of(std::begin(names), std::end(names),
                       [name](const XMLCh* plain) { return SameLetters(name, plain); });
}

Utf8Document ToUtf8(const unsigned char* bytes, std::size_t size) {
    const std::string_view text(reinterpret_cast<const char*>(bytes), size);
    const Declaration declaration = ReadDeclaration(text);
    const std::string_view encoding = FindEncoding(declaration.text);
    if (!IsName(encoding)) return {};
    if (!declaration.isEbcdic && IsPlainEncoding(ToWide(encoding))) return {};
    try {
        return Rewrite(declaration, encoding, text);
    } catch (const xercesc::OutOfMemoryException&) {
        throw std::bad_alloc();
    } catch (const xercesc::XMLException&) {
        return {};
    }
}

}  // namespace zelm

// DocumentLimits: what a document may hold, so that reading it costs time and memory in proportion
// to its length, whoever wrote it.
//
// A document of ours is three elements deep and knows 39 names. The parser keeps names in tables
// that do not grow, so a document of a million different names would take hours; and a tree costs
// many times its text. Beyond these limits a document counts as malformed.
#ifndef ZMC_FORMAT_DOCUMENTLIMITS_H
#define ZMC_FORMAT_DOCUMENTLIMITS_H

#include <cstdint>
#include <set>
#include <string>
#include <string_view>

namespace zelm {

// These limits stand in docs/format.md, and so do the refusals of BoundedParser.h and of the text's
// source (document types and NUL, with which UTF-16 goes): writers count on them, and a file that
// one version of a reader takes and another refuses helps nobody. They do not change.
inline constexpr std::uint64_t kMaxDocumentBytes = std::uint64_t{256} << 20;
inline constexpr std::uint32_t kMaxDocumentDepth = 64;
inline constexpr std::uint32_t kMaxDocumentNodes = 1u << 20;  // elements, comments, and the like
inline constexpr std::uint32_t kMaxForeignNames = 256;        // different names not of the list
inline constexpr std::uint32_t kMaxAttributes = 64;           // of one element

// Stands in files, where a store did not come to its end. XML has no such character, in any
// encoding that may begin with it, and by another first byte a text is not taken for UTF-16.
inline constexpr unsigned char kUnfinishedDocument = 0x1A;

class DocumentLimits {
public:
    std::uint32_t depth = 0;  // open elements
    std::uint32_t nodes = 0;  // nodes so far, text not counted

    void Reset();
    // Each answers null, or why the document is refused.
    const char* EnterElement(std::u16string_view name, std::size_t attributes);
    const char* TakeName(std::u16string_view name);
    const char* TakeNode();
    void LeaveElement();

private:
    std::set<std::u16string, std::less<>> foreignNames;
};

}  // namespace zelm

#endif

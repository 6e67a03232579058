#include "host/file/HeaderScanner.h"

#include <stdexcept>
#include <vector>

namespace zmchost {
namespace {

using Values = std::map<std::string, std::string, std::less<>>;

constexpr std::string_view kBlanks = " \t\r\n";
constexpr std::string_view kByteOrderMark = "\xEF\xBB\xBF";

[[noreturn]] void Refuse(const char* what) { throw std::runtime_error(what); }

bool IsBlank(std::string_view text) {
    return text.find_first_not_of(kBlanks) == std::string_view::npos;
}

std::string_view Trim(std::string_view text) {
    const auto first = text.find_first_not_of(kBlanks);
    if (first == std::string_view::npos) return {};
    return text.substr(first, text.find_last_not_of(kBlanks) - first + 1);
}

// The character that `text` begins with, written as an entity; takes it off the text.
char TakeEntity(std::string_view& text) {
    struct Entity {
        std::string_view name;
        char character;
    };
    static constexpr Entity kEntities[] = {
        {"&lt;", '<'}, {"&gt;", '>'}, {"&amp;", '&'}, {"&apos;", '\''}, {"&quot;", '"'}};
    for (const Entity& entity : kEntities)
        if (text.substr(0, entity.name.size()) == entity.name) {
            text.remove_prefix(entity.name.size());
            return entity.character;
        }
    Refuse("it has an entity that is not known");
}

std::string Unescape(std::string_view text) {
    std::string plain;
    while (!text.empty()) {
        if (text.front() == '&') {
            plain += TakeEntity(text);
            continue;
        }
        const std::string_view run = text.substr(0, text.find('&'));
        plain += run;
        text.remove_prefix(run.size());
    }
    return plain;
}

class Scanner {
public:
    explicit Scanner(std::string_view document) : rest(document) {}

    Values Run() {
        if (StartsWith(kByteOrderMark)) rest.remove_prefix(kByteOrderMark.size());
        while (!rest.empty()) Step();
        if (!open.empty() || !rootSeen) Refuse("it ends too early");
        return std::move(values);
    }

private:
    static constexpr std::size_t kLeafDepth = 3;

    std::string_view rest;
    std::vector<std::string_view> open;  // names of the open elements, the root first
    std::string text;                    // of the open leaf
    Values values;
    bool rootSeen = false;

    bool StartsWith(std::string_view what) const { return rest.substr(0, what.size()) == what; }

    void Step() {
        if (rest.front() != '<')
            TakeText();
        else if (StartsWith("<!--"))
            Skip("-->");
        else if (StartsWith("<?"))
            Skip("?>");
        else if (StartsWith("</"))
            TakeEnd();
        else if (StartsWith("<!"))
            Refuse("it has a declaration");
        else
            TakeStart();
    }

    void Skip(std::string_view terminator) {
        const auto end = rest.find(terminator);
        if (end == std::string_view::npos) Refuse("it ends too early");
        rest.remove_prefix(end + terminator.size());
    }

    void TakeText() {
        const std::string_view piece = rest.substr(0, rest.find('<'));
        rest.remove_prefix(piece.size());
        if (open.size() == kLeafDepth)
            text += Unescape(piece);
        else if (!IsBlank(piece))
            Refuse("it has text between elements");
    }

    std::string_view TakeTag(std::size_t prefix) {
        const auto end = rest.find('>');
        if (end == std::string_view::npos) Refuse("it ends too early");
        const std::string_view tag = rest.substr(prefix, end - prefix);
        rest.remove_prefix(end + 1);
        return tag;
    }

    void TakeStart() {
        std::string_view tag = TakeTag(1);
        const bool closed = !tag.empty() && tag.back() == '/';
        if (closed) tag.remove_suffix(1);
        const std::string_view name = tag.substr(0, tag.find_first_of(kBlanks));
        if (name.empty()) Refuse("it has an element without a name");
        if (open.size() == kLeafDepth) Refuse("its elements are nested too deep");
        if (open.empty() && (rootSeen || name != "DATASET")) Refuse("its root is not DATASET");
        rootSeen = true;
        open.push_back(name);
        text.clear();
        if (closed) Close();
    }

    void TakeEnd() {
        if (Trim(TakeTag(2)) != (open.empty() ? std::string_view() : open.back()) || open.empty())
            Refuse("its tags do not match");
        Close();
    }

    void Close() {
        if (open.size() == kLeafDepth && open[1] == "HEADER")
            values.insert_or_assign(std::string(open.back()), std::string(Trim(text)));
        open.pop_back();
    }
};

}  // namespace

Values ScanHeaderDocument(std::string_view document) { return Scanner(document).Run(); }

}  // namespace zmchost

#include "serve/LayerId.h"

#include <optional>

#include "serve/Request.h"

namespace zmcserve {

std::string LayerIdOf(std::string_view name) {
    std::string id;
    for (const char c : name) id += c == '~' ? "%7E" : PercentEncoded({&c, 1});
    for (char& c : id)
        if (c == '%') c = '~';
    return id;
}

std::string NameOfLayerId(std::string_view id) {
    std::string name;
    for (std::size_t i = 0; i < id.size(); ++i) {
        std::optional<std::string> byte;
        if (id[i] == '~' && i + 2 < id.size()) {
            const char escape[] = {'%', id[i + 1], id[i + 2]};
            byte = PercentDecoded({escape, sizeof escape});
        }
        if (byte) i += 2;
        name += byte ? *byte : std::string(1, id[i]);
    }
    return name;
}

}  // namespace zmcserve

// Pages: the files of the viewer, which the build puts into the program.
//
// There are none in a build without the viewer (cmake/EmbedPages.cmake); then the root shows a
// plain list of the files.
#ifndef ZMC_SERVE_PAGES_H
#define ZMC_SERVE_PAGES_H

#include <span>
#include <string_view>

namespace zmcserve {

struct Page {
    std::string_view path;  // "index.html", "assets/viewer.js"
    std::string_view type;
    std::string_view bytes;
    std::string_view version;  // letters and digits, another one for other bytes
};

std::span<const Page> Pages();

}  // namespace zmcserve

#endif

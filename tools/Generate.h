// The man page and the bash completion, made from the same table of commands as the help.
#ifndef ZMC_TOOLS_GENERATE_H
#define ZMC_TOOLS_GENERATE_H

#include <string>

namespace CLI {
class App;
}

namespace zmctools {

std::string MakeManPage(const CLI::App& app);
std::string MakeCompletion(const CLI::App& app);

// What the exit statuses mean, for the help and the man page.
extern const char* const kExitStatusText;

}  // namespace zmctools

#endif

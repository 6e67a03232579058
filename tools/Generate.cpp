#include "tools/Generate.h"

#include <CLI/CLI.hpp>
#include <sstream>

namespace zmctools {

const char* const kExitStatusText =
    "0 done, 1 failed, 2 the command line is wrong, 3 differences were found, 130 interrupted";

namespace {

std::vector<const CLI::App*> CommandsOf(const CLI::App& app) {
    return app.get_subcommands(
        [](const CLI::App* command) { return !command->get_group().empty(); });
}

// For roff: a line must not begin with a dot or a quote, and a hyphen is written as a minus.
std::string Escape(const std::string& text) {
    std::string out;
    for (const char c : text) {
        if (c == '\\')
            out += "\\e";
        else if (c == '-')
            out += "\\-";
        else if ((c == '.' || c == '\'') && (out.empty() || out.back() == '\n'))
            out += std::string("\\&") + c;
        else
            out += c;
    }
    return out;
}

// The words that an option takes, from the "{a,b,c}" in the name of its type.
std::vector<std::string> ChoicesOf(const CLI::Option& option) {
    std::vector<std::string> words;
    const std::string type = option.get_type_name();
    const auto open = type.find('{');
    const auto close = type.find('}');
    if (open == type.npos || close == type.npos) return words;
    std::istringstream list(type.substr(open + 1, close - open - 1));
    for (std::string word; std::getline(list, word, ',');) words.push_back(word);
    return words;
}

std::string TypeOf(const CLI::Option& option) {
    const std::string type = option.get_type_name();
    return type.substr(0, type.find(':'));
}

void WriteOption(std::ostream& out, const CLI::Option& option) {
    out << ".TP\n.B " << Escape(option.get_name(option.get_positional(), true));
    if (!option.get_positional() && option.get_items_expected_max() > 0)
        out << " \\fI" << Escape(TypeOf(option)) << "\\fR";
    out << '\n' << Escape(option.get_description());
    const auto choices = ChoicesOf(option);
    for (std::size_t i = 0; i < choices.size(); ++i)
        out << (i == 0 ? "; one of " : ", ") << Escape(choices[i]);
    out << ".\n";
}

void WriteCommand(std::ostream& out, const CLI::App& command) {
    out << ".SS " << command.get_name();
    for (const CLI::Option* option : command.get_options())
        if (option->get_positional())
            out << ' ' << Escape(option->get_name(true))
                << (option->get_items_expected_max() > 1 ? "..." : "");
    out << '\n' << Escape(command.get_description()) << ".\n";
    for (const bool byPlace : {true, false})
        for (const CLI::Option* option : command.get_options())
            if (option->get_positional() == byPlace) WriteOption(out, *option);
    out << ".PP\n.nf\n" << Escape(command.get_footer()) << "\n.fi\n";
}

std::string LongNames(const CLI::App& app) {
    std::string names;
    for (const CLI::Option* option : app.get_options())
        for (const std::string& name : option->get_lnames()) names += " --" + name;
    return names.empty() ? names : names.substr(1);
}

}  // namespace

std::string MakeManPage(const CLI::App& app) {
    std::ostringstream out;
    out << ".TH ZMCRASTER 1 \"\" \"zmcraster " ZMC_VERSION "\" \"User Commands\"\n"
        << ".SH NAME\nzmcraster \\- " << Escape(app.get_description()) << '\n'
        << ".SH SYNOPSIS\n.B zmcraster\n\\fICOMMAND\\fR [\\fIOPTION\\fR]... "
           "[\\fIARGUMENT\\fR]...\n.SH DESCRIPTION\n"
        << "Bands count from 1, levels from 0, the finest. Results go to standard output, progress "
           "and messages to standard error; a message is one line that names the file and what is "
           "wrong. The bar is drawn on a terminal only.\n"
        << ".SH OPTIONS\n";
    for (const CLI::Option* option : app.get_options()) WriteOption(out, *option);
    out << ".SH COMMANDS\n";
    for (const CLI::App* command : CommandsOf(app)) WriteCommand(out, *command);
    out << ".SH EXIT STATUS\n"
        << Escape(kExitStatusText) << ".\n"
        << ".SH ENVIRONMENT\n.TP\n.B ZMCRASTER_MODULE\nAbsolute path of the raster module, where "
           "it "
           "is not to be the one that was installed with the program.\n.TP\n.B ZMC_LIMITS\nWhat a "
           "file may claim, as with \\-\\-limit: bands=100000,tile=1G.\n";
    return out.str();
}

std::string MakeCompletion(const CLI::App& app) {
    std::string commands;
    std::ostringstream cases;
    for (const CLI::App* command : CommandsOf(app)) {
        commands += (commands.empty() ? "" : " ") + command->get_name();
        cases << "        " << command->get_name() << ") options=\"" << LongNames(*command)
              << "\" ;;\n";
    }
    std::ostringstream values;
    for (const CLI::App* command : CommandsOf(app))
        for (const CLI::Option* option : command->get_options()) {
            const auto choices = ChoicesOf(*option);
            if (choices.empty()) continue;
            values << "        " << command->get_name() << ":--" << option->get_lnames().front()
                   << ") words=\"";
            for (const std::string& word : choices) values << word << ' ';
            values << "\" ;;\n";
        }
    return "# bash completion of zmcraster\n"
           "_zmcraster() {\n"
           "    local current=\"${COMP_WORDS[COMP_CWORD]}\" "
           "before=\"${COMP_WORDS[COMP_CWORD-1]}\"\n"
           "    local command=\"${COMP_WORDS[1]}\" options=\"\" words=\"\"\n"
           "    COMPREPLY=()\n"
           "    if [ \"$COMP_CWORD\" -eq 1 ]; then\n"
           "        mapfile -t COMPREPLY < <(compgen -W \"" +
           commands + " " + LongNames(app) +
           "\" -- \"$current\")\n"
           "        return\n"
           "    fi\n"
           "    case \"$command:$before\" in\n" +
           values.str() +
           "    esac\n"
           "    if [ -n \"$words\" ]; then\n"
           "        mapfile -t COMPREPLY < <(compgen -W \"$words\" -- \"$current\")\n"
           "        return\n"
           "    fi\n"
           "    case \"$command\" in\n" +
           cases.str() +
           "    esac\n"
           "    if [[ \"$current\" == -* ]]; then\n"
           "        mapfile -t COMPREPLY < <(compgen -W \"$options\" -- \"$current\")\n"
           "    else\n"
           "        mapfile -t COMPREPLY < <(compgen -f -- \"$current\")\n"
           "    fi\n"
           "}\n"
           "complete -o filenames -F _zmcraster zmcraster\n";
}

}  // namespace zmctools

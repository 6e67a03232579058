// OptionTable: what a command's part of the command line understands.
//
// Commands tell their words here; the library that parses them, whose headers take seconds to
// compile, is seen by few sources. Help, man page and completion are all made from this table. A
// variable that a word is bound to must outlive the parse; it keeps its value where the word is not
// given.
#ifndef ZMC_TOOLS_OPTIONTABLE_H
#define ZMC_TOOLS_OPTIONTABLE_H

#include <string>
#include <vector>

namespace CLI {
class App;
class Option;
}  // namespace CLI

namespace zmctools {

class OptionTable {
public:
    // One word, to say more of it.
    class Word {
    public:
        explicit Word(CLI::Option& described) : option(described) {}
        Word& Required();
        // How help writes its value.
        Word& Named(const char* value);
        // Only these values are taken, in any case of letters; the variable gets them as here.
        Word& OneOf(const std::vector<std::string>& values);
        // An empty value is refused, with these words.
        Word& Filled(const char* refusal);

    private:
        CLI::Option& option;
    };

    explicit OptionTable(CLI::App& commandLine) : app(commandLine) {}

    // A word with a value: an option if `names` begins with a dash, else an argument by its place.
    Word Text(const char* names, std::string& value, const char* help);
    // The same, given any number of times, with one value each.
    Word Texts(const char* names, std::vector<std::string>& values, const char* help);
    // An argument by its place that takes all that stand there.
    Word Names(const char* name, std::vector<std::string>& values, const char* help);
    // A word without a value.
    void Flag(const char* names, bool& given, const char* help);
    // What help ends with: examples, and what has to be known.
    void Footer(const char* text);

private:
    CLI::App& app;
};

}  // namespace zmctools

#endif

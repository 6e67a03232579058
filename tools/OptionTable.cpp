#include "tools/OptionTable.h"

#include <CLI/CLI.hpp>

namespace zmctools {

OptionTable::Word& OptionTable::Word::Required() {
    option.required();
    return *this;
}

OptionTable::Word& OptionTable::Word::Named(const char* value) {
    option.type_name(value);
    return *this;
}

OptionTable::Word& OptionTable::Word::OneOf(const std::vector<std::string>& values) {
    option.transform(CLI::IsMember(values, CLI::ignore_case));
    return *this;
}

OptionTable::Word& OptionTable::Word::Filled(const char* refusal) {
    option.check(
        [refusal](const std::string& value) {
            return value.empty() ? std::string(refusal) : std::string();
        },
        "");
    return *this;
}

OptionTable::Word OptionTable::Text(const char* names, std::string& value, const char* help) {
    return Word(*app.add_option(names, value, help));
}

OptionTable::Word OptionTable::Texts(const char* names, std::vector<std::string>& values,
                                     const char* help) {
    return Word(*app.add_option(names, values, help)->type_size(1)->allow_extra_args(false));
}

OptionTable::Word OptionTable::Names(const char* name, std::vector<std::string>& values,
                                     const char* help) {
    return Word(*app.add_option(name, values, help));
}

void OptionTable::Flag(const char* names, bool& given, const char* help) {
    app.add_flag(names, given, help);
}

void OptionTable::Footer(const char* text) { app.footer(text); }

}  // namespace zmctools

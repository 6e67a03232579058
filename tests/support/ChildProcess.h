// Runs a program in a process of its own and collects what it wrote.
#ifndef ZMC_TESTS_SUPPORT_CHILDPROCESS_H
#define ZMC_TESTS_SUPPORT_CHILDPROCESS_H

#include <fcntl.h>
#include <sys/wait.h>
#include <unistd.h>

#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <string>
#include <vector>

namespace zmctest {

struct ChildResult {
    int status = -1;  // exit status, or minus the signal that ended it
    std::string out;
    std::string err;
};

inline std::string TakeText(std::FILE* file) {
    std::string text;
    std::rewind(file);
    char part[4096];
    while (const std::size_t size = std::fread(part, 1, sizeof part, file)) text.append(part, size);
    std::fclose(file);
    return text;
}

// `environment` holds "NAME=value" to set and "NAME" to remove. `input` is what the program reads.
inline ChildResult RunChild(const std::vector<std::string>& command,
                            const std::vector<std::string>& environment = {},
                            const std::string& input = {}) {
    std::FILE* const in = std::tmpfile();
    std::FILE* const out = std::tmpfile();
    std::FILE* const err = std::tmpfile();
    if (!in || !out || !err) return {};
    std::fwrite(input.data(), 1, input.size(), in);
    std::fflush(in);
    std::rewind(in);
    const pid_t child = fork();
    if (child == 0) {
        for (const std::string& entry : environment) {
            const std::size_t equals = entry.find('=');
            if (equals == entry.npos)
                unsetenv(entry.c_str());
            else
                setenv(entry.substr(0, equals).c_str(), entry.c_str() + equals + 1, 1);
        }
        std::vector<char*> arguments;
        for (const std::string& word : command) arguments.push_back(strdup(word.c_str()));
        arguments.push_back(nullptr);
        dup2(fileno(in), 0);
        dup2(fileno(out), 1);
        dup2(fileno(err), 2);
        execvp(arguments[0], arguments.data());
        _exit(127);
    }
    ChildResult result;
    int status = 0;
    if (child > 0 && waitpid(child, &status, 0) == child)
        result.status = WIFEXITED(status) ? WEXITSTATUS(status) : -WTERMSIG(status);
    std::fclose(in);
    result.out = TakeText(out);
    result.err = TakeText(err);
    return result;
}

}  // namespace zmctest

#endif

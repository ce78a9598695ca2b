#include "run_tool.h"

#include <cstdlib>
#include <sstream>
#include <sys/mman.h>
#include <sys/wait.h>
#include <unistd.h>
#include <vector>

static std::string
read_all(int fd)
{
    std::string text;
    char buffer[4096];
    lseek(fd, 0, SEEK_SET);
    for (ssize_t n; (n = read(fd, buffer, sizeof buffer)) > 0;)
        text.append(buffer, static_cast<size_t>(n));
    close(fd);
    return text;
}

static std::vector<std::string>
command_words()
{
    std::vector<std::string> words;
    const char* runner_words = getenv("TZLINKS_RUNNER");
    std::istringstream runner(runner_words ? runner_words : "");
    for (std::string word; runner >> word;)
        words.push_back(word);
    words.push_back(TZLINKS_BINARY);
    return words;
}

tool_run
run_tzlinks()
{
    std::vector<std::string> words = command_words();
    std::vector<char*> argv;
    for (std::string& word : words)
        argv.push_back(word.data());
    argv.push_back(nullptr);

    // Anonymous files rather than pipes: nothing to drain while waiting.
    int out = memfd_create("tzlinks-stdout", MFD_CLOEXEC);
    int err = memfd_create("tzlinks-stderr", MFD_CLOEXEC);
    pid_t child = fork();
    if (child == 0) {
        dup2(out, STDOUT_FILENO);
        dup2(err, STDERR_FILENO);
        execvp(argv[0], argv.data());
        _exit(127);
    }
    int wait_status = 0;
    waitpid(child, &wait_status, 0);
    int status = WIFEXITED(wait_status) ? WEXITSTATUS(wait_status) : 128 + WTERMSIG(wait_status);
    return {status, read_all(out), read_all(err)};
}

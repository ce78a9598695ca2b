// SPDX-License-Identifier: Apache-2.0
// Times commands run in turn, one run of each a round, so that whatever
// else the machine does at a given moment weighs on all of them alike. The
// ratio to the first command is taken round by round; its median is
// steadier than a ratio of medians on a shared machine.
//
// Usage: interleave SPECFILE ROUNDS WARMUP
//   SPECFILE: one command a line, fields separated by tabs:
//     NAME  PREPARE  WORD [WORD ...]
//   PREPARE is a shell command run untimed before every run ("-": none).
//   The words, split at spaces, are spawned without a shell, standard
//   output and error on /dev/null. An exit status above 1 (1 is a run
//   with warnings) stops it.
// Prints one line a command: NAME MEDIAN_MICROSECONDS MEDIAN_RATIO.
#include <algorithm>
#include <cstdio>
#include <cstdlib>
#include <fcntl.h>
#include <fstream>
#include <spawn.h>
#include <sstream>
#include <string>
#include <sys/wait.h>
#include <time.h>
#include <vector>

extern char** environ;

struct command {
    std::string name, prepare;
    std::vector<std::string> words;
    std::vector<double> micros, ratios;
};

static double
now()
{
    timespec t;
    clock_gettime(CLOCK_MONOTONIC, &t);
    return static_cast<double>(t.tv_sec) * 1e6 + static_cast<double>(t.tv_nsec) / 1e3;
}

// The time from spawn to reaped, or -1 when the run failed.
static double
run(const command& c)
{
    if (c.prepare != "-" && std::system(c.prepare.c_str()) != 0)
        return -1;
    std::vector<char*> argv;
    for (const std::string& word : c.words)
        argv.push_back(const_cast<char*>(word.c_str()));
    argv.push_back(nullptr);
    posix_spawn_file_actions_t quiet;
    posix_spawn_file_actions_init(&quiet);
    posix_spawn_file_actions_addopen(&quiet, 1, "/dev/null", O_WRONLY, 0);
    posix_spawn_file_actions_addopen(&quiet, 2, "/dev/null", O_WRONLY, 0);
    pid_t pid;
    int status = 0;
    double start = now();
    bool ran = posix_spawn(&pid, argv[0], &quiet, nullptr, argv.data(), environ) == 0 &&
               waitpid(pid, &status, 0) == pid;
    double elapsed = now() - start;
    posix_spawn_file_actions_destroy(&quiet);
    return ran && WIFEXITED(status) && WEXITSTATUS(status) <= 1 ? elapsed : -1;
}

static double
median(std::vector<double> v)
{
    std::sort(v.begin(), v.end());
    return v[v.size() / 2];
}

int
main(int argc, char** argv)
{
    if (argc != 4) {
        std::fprintf(stderr, "usage: interleave SPECFILE ROUNDS WARMUP\n");
        return 64;
    }
    std::vector<command> commands;
    std::ifstream spec(argv[1]);
    for (command c; std::getline(spec, c.name, '\t') && std::getline(spec, c.prepare, '\t');) {
        std::string words;
        std::getline(spec, words);
        std::istringstream split(words);
        for (std::string word; split >> word;)
            c.words.push_back(word);
        if (!c.words.empty())
            commands.push_back(c);
        c.words.clear();
    }
    int rounds = std::atoi(argv[2]), warmup = std::atoi(argv[3]);
    if (commands.empty() || rounds < 1)
        return 64;
    for (int round = -warmup; round < rounds; ++round) {
        for (command& c : commands) {
            double t = run(c);
            if (t < 0) {
                std::fprintf(stderr, "interleave: %s failed\n", c.name.c_str());
                return 1;
            }
            if (round < 0)
                continue; // warming up
            c.micros.push_back(t);
            c.ratios.push_back(t / commands[0].micros.back());
        }
    }
    for (const command& c : commands)
        std::printf("%s\t%.0f\t%.3f\n", c.name.c_str(), median(c.micros), median(c.ratios));
    return 0;
}

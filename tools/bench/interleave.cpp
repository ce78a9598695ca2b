// SPDX-License-Identifier: Apache-2.0
// Times several commands run in turn, one run of each per round, so that
// whatever else the machine is doing at a given moment weighs on all of them
// alike. Ratios are taken run by run against the first command (the floor),
// then their median is reported.
//
// Usage: interleave SPECFILE ROUNDS WARMUP
//   SPECFILE: one command per line, fields separated by tabs:
//     NAME  PREPARE  WORD [WORD ...]
//   PREPARE is a shell command run untimed before every run ("-": none);
//   the command's words are separated by single spaces and spawned
//   directly, without a shell, with standard output and error on /dev/null.
// Prints one tab-separated line per command, wall times first, then the CPU
// time the run itself used (user + system, from wait4), which other load on
// the machine disturbs far less than the wall time:
//   NAME RUNS MEDIAN_US P10_US P90_US MEDIAN_RATIO CPU_US CPU_RATIO
// (The peak RSS that wait4 reports is no use here: posix_spawn's child
// shares this process's memory until exec, and that counts.)
#include <algorithm>
#include <cstdio>
#include <cstdlib>
#include <fstream>
#include <spawn.h>
#include <sstream>
#include <string>
#include <sys/resource.h>
#include <sys/wait.h>
#include <time.h>
#include <vector>

extern char** environ;

struct command {
    std::string name;
    std::string prepare;
    std::vector<std::string> words;
    std::vector<double> micros;
    std::vector<double> ratios;
    std::vector<double> cpu_micros;
    std::vector<double> cpu_ratios;
};

static std::vector<command>
read_spec(const char* path)
{
    std::vector<command> commands;
    std::ifstream in(path);
    for (std::string line; std::getline(in, line);) {
        if (line.empty())
            continue;
        std::istringstream fields(line);
        command c;
        std::string words;
        std::getline(fields, c.name, '\t');
        std::getline(fields, c.prepare, '\t');
        std::getline(fields, words);
        std::istringstream split(words);
        for (std::string word; split >> word;)
            c.words.push_back(word);
        commands.push_back(c);
    }
    return commands;
}

static double
now_micros()
{
    timespec t;
    clock_gettime(CLOCK_MONOTONIC, &t);
    return static_cast<double>(t.tv_sec) * 1e6 + static_cast<double>(t.tv_nsec) / 1e3;
}

// Spawns the words, waits, and returns the exit status (-1 when it did not
// exit normally); usage receives what the child used.
static int
spawn_and_wait(const std::vector<std::string>& words, rusage& usage)
{
    std::vector<char*> argv;
    for (const std::string& word : words)
        argv.push_back(const_cast<char*>(word.c_str()));
    argv.push_back(nullptr);
    posix_spawn_file_actions_t actions;
    posix_spawn_file_actions_init(&actions);
    posix_spawn_file_actions_addopen(&actions, 1, "/dev/null", 01 /* O_WRONLY */, 0);
    posix_spawn_file_actions_addopen(&actions, 2, "/dev/null", 01 /* O_WRONLY */, 0);
    pid_t pid;
    int failed = posix_spawn(&pid, argv[0], &actions, nullptr, argv.data(), environ);
    posix_spawn_file_actions_destroy(&actions);
    if (failed != 0)
        return -1;
    int status = 0;
    wait4(pid, &status, 0, &usage);
    return WIFEXITED(status) ? WEXITSTATUS(status) : -1;
}

static double
micros(const timeval& t)
{
    return static_cast<double>(t.tv_sec) * 1e6 + static_cast<double>(t.tv_usec);
}

static double
percentile(std::vector<double> values, double p)
{
    std::sort(values.begin(), values.end());
    size_t index = static_cast<size_t>(p * static_cast<double>(values.size() - 1) + 0.5);
    return values[index];
}

int
main(int argc, char** argv)
{
    if (argc != 4) {
        std::fprintf(stderr, "usage: %s SPECFILE ROUNDS WARMUP\n", argv[0]);
        return 64;
    }
    std::vector<command> commands = read_spec(argv[1]);
    int rounds = std::atoi(argv[2]);
    int warmup = std::atoi(argv[3]);
    if (commands.empty() || rounds < 1)
        return 64;

    for (int round = -warmup; round < rounds; ++round) {
        std::vector<double> times;
        std::vector<double> cpu_times;
        for (command& c : commands) {
            if (c.prepare != "-" && std::system(c.prepare.c_str()) != 0) {
                std::fprintf(stderr, "prepare failed for %s\n", c.name.c_str());
                return 1;
            }
            rusage usage{};
            double start = now_micros();
            int status = spawn_and_wait(c.words, usage);
            double elapsed = now_micros() - start;
            if (status != 0) {
                std::fprintf(stderr, "%s exited with %d\n", c.name.c_str(), status);
                return 1;
            }
            double cpu = micros(usage.ru_utime) + micros(usage.ru_stime);
            times.push_back(elapsed);
            cpu_times.push_back(cpu);
            if (round < 0)
                continue;
            c.micros.push_back(elapsed);
            c.cpu_micros.push_back(cpu);
        }
        if (round < 0)
            continue;
        for (size_t i = 0; i < commands.size(); ++i) {
            commands[i].ratios.push_back(times[i] / times[0]);
            // A run shorter than the clock's tick can show 0 µs of CPU time.
            if (cpu_times[0] > 0)
                commands[i].cpu_ratios.push_back(cpu_times[i] / cpu_times[0]);
        }
    }

    for (const command& c : commands)
        std::printf("%s\t%zu\t%.1f\t%.1f\t%.1f\t%.3f\t%.1f\t%.3f\n", c.name.c_str(),
                    c.micros.size(), percentile(c.micros, 0.5), percentile(c.micros, 0.1),
                    percentile(c.micros, 0.9), percentile(c.ratios, 0.5),
                    percentile(c.cpu_micros, 0.5),
                    c.cpu_ratios.empty() ? 0.0 : percentile(c.cpu_ratios, 0.5));
    return 0;
}

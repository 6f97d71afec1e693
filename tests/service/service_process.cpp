// service_process.cpp - see service_process.h.
#include "service/service_process.h"

#include <algorithm>
#include <csignal>
#include <cstdlib>
#include <cstring>
#include <fstream>
#include <stdexcept>

#include <poll.h>
#include <spawn.h>
#include <sys/wait.h>
#include <unistd.h>

extern char **environ;

namespace service_test {

namespace {

constexpr int START_LIMIT_MS = 60000; // patience with a machine that does other things too

// Reads the first line of the pipe; what came until the time was up if there is none.
std::string read_line(int pipe)
{
    std::string line;
    for (;;) {
        pollfd readable{pipe, POLLIN, 0};
        char c;
        if (poll(&readable, 1, START_LIMIT_MS) != 1 || read(pipe, &c, 1) != 1 || c == '\n')
            return line;
        line.push_back(c);
    }
}

} // namespace

scratch_directory::scratch_directory()
{
    std::string name = std::filesystem::temp_directory_path() / "zuv-service-test-XXXXXX";
    if (mkdtemp(name.data()) == nullptr)
        throw std::runtime_error("no scratch directory: " + name);
    path_ = name;
}

scratch_directory::~scratch_directory()
{
    std::error_code ignored;
    std::filesystem::remove_all(path_, ignored);
}

service_process::service_process(std::vector<std::string> options)
{
    const char *const program = ZUV_SERVICE_PROGRAM;
    if (std::find(options.begin(), options.end(), "--database") == options.end())
        options.insert(options.end(), {"--database", scratch_.file("documents.db")});
    options.insert(options.begin(), {program, "--port", "0"});
    std::vector<char *> arguments;
    for (std::string &option : options)
        arguments.push_back(option.data());
    arguments.push_back(nullptr);
    int ends[2];
    if (pipe(ends) != 0)
        throw std::runtime_error("no pipe");
    posix_spawn_file_actions_t actions;
    posix_spawn_file_actions_init(&actions);
    posix_spawn_file_actions_adddup2(&actions, ends[1], STDOUT_FILENO);
    posix_spawn_file_actions_addclose(&actions, ends[0]);
    posix_spawn_file_actions_addclose(&actions, ends[1]);
    const int failure = posix_spawn(&pid_, program, &actions, nullptr, arguments.data(), environ);
    posix_spawn_file_actions_destroy(&actions);
    close(ends[1]);
    output_ = ends[0];
    if (failure != 0) {
        pid_ = -1;
        return;
    }
    const std::string line = read_line(output_);
    const std::size_t colon = line.rfind(':');
    if (line.starts_with("listening on http://") && colon != line.npos)
        port_ = std::atoi(line.c_str() + colon + 1);
}

service_process::~service_process()
{
    kill();
    close(output_);
}

std::string service_process::url(const char *port_name) const
{
    return "http://127.0.0.1:" + std::to_string(port_) + "/zuv/v1.0/services/" + port_name;
}

long service_process::peak_memory() const
{
    std::ifstream status("/proc/" + std::to_string(pid_) + "/status");
    for (std::string line; std::getline(status, line);)
        if (line.starts_with("VmHWM:"))
            return std::atol(line.c_str() + 6);
    return -1;
}

bool service_process::running()
{
    return pid_ > 0 && waitpid(pid_, nullptr, WNOHANG) == 0;
}

int service_process::wait_for_end()
{
    int status = 0;
    const pid_t ended = waitpid(pid_, &status, 0);
    pid_ = -1;
    if (ended < 0)
        return -SIGABRT; // it had ended before of its own accord
    return WIFEXITED(status) ? WEXITSTATUS(status) : -WTERMSIG(status);
}

int service_process::stop()
{
    if (pid_ <= 0)
        return -SIGABRT;
    ::kill(pid_, SIGTERM);
    return wait_for_end();
}

void service_process::kill()
{
    if (pid_ <= 0)
        return;
    ::kill(pid_, SIGKILL);
    wait_for_end();
}

} // namespace service_test

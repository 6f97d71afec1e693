// service_process.cpp - see service_process.h.
#include "soak/service_process.h"

#include <csignal>
#include <cstdlib>
#include <filesystem>
#include <stdexcept>

#include <poll.h>
#include <sys/wait.h>
#include <unistd.h>

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

service_process::service_process() : folder_(std::filesystem::temp_directory_path() / "zuv-soak-XXXXXX")
{
    int ends[2];
    if (mkdtemp(folder_.data()) == nullptr || pipe(ends) != 0 || (pid_ = fork()) < 0)
        throw std::runtime_error("the service can't be started: " + folder_);
    if (pid_ == 0) {
        dup2(ends[1], STDOUT_FILENO);
        close(ends[0]);
        close(ends[1]);
        execl(ZUV_SERVICE_PROGRAM, "zuv-service", "--port", "0", "--database",
              (folder_ + "/documents.db").c_str(), nullptr);
        _exit(127);
    }
    close(ends[1]);
    output_ = ends[0];
    const std::string line = read_line(output_);
    if (line.starts_with("listening on http://"))
        port_ = std::atoi(line.c_str() + line.rfind(':') + 1);
}

service_process::~service_process()
{
    end(SIGKILL);
    close(output_);
    std::error_code ignored;
    std::filesystem::remove_all(folder_, ignored);
}

std::string service_process::url(const char *port_name) const
{
    return "http://127.0.0.1:" + std::to_string(port_) + "/zuv/v1.0/services/" + port_name;
}

int service_process::stop()
{
    return end(SIGTERM);
}

int service_process::end(int signal)
{
    int status = 0;
    if (pid_ <= 0 || kill(pid_, signal) != 0 || waitpid(pid_, &status, 0) != pid_)
        return -SIGABRT;
    pid_ = -1;
    return WIFEXITED(status) ? WEXITSTATUS(status) : -WTERMSIG(status);
}

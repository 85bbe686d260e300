#include "ChildProcess.h"

#include <fcntl.h>
#include <signal.h>
#include <sys/wait.h>
#include <unistd.h>

#include <chrono>
#include <cstdlib>
#include <filesystem>
#include <fstream>
#include <sstream>
#include <thread>

#include <gtest/gtest.h>

namespace zarl::test {

std::string ReadFile(const std::string& path) {
    std::ifstream in(path, std::ios::binary);
    std::ostringstream text;
    text << in.rdbuf();
    return text.str();
}

void WriteFile(const std::string& path, const std::string& bytes) {
    std::ofstream(path, std::ios::binary) << bytes;
}

ChildProcess::ChildProcess(std::vector<std::string> argv, const std::string& input,
                           const std::vector<std::string>& env) {
    char pattern[] = "/tmp/zarl-test-child-XXXXXX";
    dir = ::mkdtemp(pattern);
    WriteFile(dir + "/in", input);
    pid = ::fork();
    if (pid == 0) {
        ::dup2(::open((dir + "/in").c_str(), O_RDONLY), 0);
        ::dup2(::open((dir + "/out").c_str(), O_WRONLY | O_CREAT | O_TRUNC, 0644), 1);
        ::dup2(::open((dir + "/err").c_str(), O_WRONLY | O_CREAT | O_TRUNC, 0644), 2);
        ::unsetenv("ZARL_HOME");
        for (const std::string& setting : env) {
            ::putenv(const_cast<char*>(setting.c_str()));
        }
        std::vector<char*> args;
        for (std::string& arg : argv) {
            args.push_back(arg.data());
        }
        args.push_back(nullptr);
        if (::chdir(dir.c_str()) == 0) {
            ::execv(args[0], args.data());
        }
        ::_exit(127);
    }
}

ChildProcess::~ChildProcess() {
    if (!ended) {
        ::kill(pid, SIGKILL);
        ::waitpid(pid, &rawStatus, 0);
    }
    std::filesystem::remove_all(dir);
}

bool ChildProcess::WaitForStderr(const std::string& text) {
    Poll(text);
    return ReadFile(dir + "/err").find(text) != std::string::npos;
}

ChildResult ChildProcess::Wait() {
    if (!Poll("")) {
        ::kill(pid, SIGKILL);
        ::waitpid(pid, &rawStatus, 0);
        ended = true;
        ADD_FAILURE() << "the child hung and was killed";
    }
    return {WIFEXITED(rawStatus) ? WEXITSTATUS(rawStatus) : -1, ReadFile(dir + "/out"),
            ReadFile(dir + "/err")};
}

// Checks every 10 ms, for up to 120 s, until the child ends or (for a non-empty `text`)
// has written `text` to standard error; true when it ended.
bool ChildProcess::Poll(const std::string& text) {
    for (int i = 0; i < 12000 && !ended; ++i) {
        if (!text.empty() && ReadFile(dir + "/err").find(text) != std::string::npos) {
            break;
        }
        ended = ::waitpid(pid, &rawStatus, WNOHANG) == pid;
        std::this_thread::sleep_for(std::chrono::milliseconds(ended ? 0 : 10));
    }
    return ended;
}

}  // namespace zarl::test

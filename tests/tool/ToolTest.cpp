// The zarl tool as a user runs it: a real child process with real files and real
// datagrams on 127.0.0.1. Its outputs are compared byte for byte with the library's
// texts, and every console example of the README is run and its output compared.

#include <unistd.h>

#include <cstdio>
#include <list>
#include <sstream>
#include <string>
#include <vector>

#include <gtest/gtest.h>

#include <zarl/core.h>

#include "ChildProcess.h"

namespace {

using namespace zarl::core;
using Strings = std::vector<std::string>;

const std::string kTool = ZARL_TOOL;
const std::string kDelimiter(ZARL_MESSAGE_DELIMITER, ZARL_MESSAGE_DELIMITER_LENGTH);

using zarl::test::ChildProcess;
using zarl::test::ReadFile;
using zarl::test::WriteFile;
using Result = zarl::test::ChildResult;

Result Zarl(Strings args, const std::string& input = "", const Strings& env = {}) {
    args.insert(args.begin(), kTool);
    return ChildProcess(args, input, env).Wait();
}

// An error is one line on standard error that begins with "zarl: ".
void ExpectOneErrorLine(const Result& result) {
    EXPECT_EQ(result.err.rfind("zarl: ", 0), 0u) << result.err;
    EXPECT_EQ(result.err.find('\n'), result.err.size() - 1) << result.err;
    EXPECT_EQ(result.out, "");
}

// `head`, the six request attributes as options (values that need encoding), `tail`.
Strings Cmd(Strings head, const Strings& tail, const std::string& requestName = "Mount") {
    for (const char* arg :
         {"--subsystem", "Vol&ume", "--request-name", requestName.c_str(), "--requester", "<cli>",
          "--sequence", "17", "--mount-point", "/shares/a/", "--path", "d\"o's"}) {
        head.push_back(arg);
    }
    head.insert(head.end(), tail.begin(), tail.end());
    return head;
}

TEST(ToolTest, MessageCommandsPrintTheLibraryTextsByteForByte) {
    const auto request = [](const std::string& content) {
        return ZARLRequest("Vol&ume", "Mount", "<cli>", "17", "/shares/a/", "d\"o's", content)
            .str();
    };
    const auto response = [](const std::string& name, std::list<std::string> items) {
        return ZARLResponse("Vol&ume", name, "<cli>", "17", "/shares/a/", "d\"o's", "ok", "a\tb",
                            items)
            .str();
    };
    const std::string binary("<a>\0\n\xff</a>", 11);
    struct Case {
        Strings args;
        std::string input;
        std::string expected;
    };
    const std::vector<Case> cases = {
        {{"request"}, "", ZARLRequest("", "", "", "", "", "", "").str()},
        {Cmd({"request"}, {"--content", "<c x=\"1\">&amp;</c>"}), "",
         request("<c x=\"1\">&amp;</c>")},
        {Cmd({"request"}, {"--content-file", "-"}), binary, request(binary)},
        {Cmd({"request"}, {"--item", "<a/>", "--item=-b", "--item", ""}), "",
         ZARLRequest("Vol&ume", "Mount", "<cli>", "17", "/shares/a/", "d\"o's",
                     std::list<std::string>{"<a/>", "-b", ""})
             .str()},
        {Cmd({"request", "--framed"}, {"--content", "x"}), "", request("x") + kDelimiter},
        {Cmd({"response"},
             {"--status", "ok", "--message", "a\tb", "--item", " H = \"1\"", "--item", ">"},
             "GetStatus"),
         "", response("GetStatus", {" H = \"1\"", ">"})},
        {Cmd({"response"},
             {"--status", "ok", "--message", "a\tb", "--item", "<x/>", "--item", "<y/>"}),
         "", response("Mount", {"<x/>", "<y/>"})},
        {Cmd({"response", "--framed"},
             {"--status", "ok", "--message", "a\tb", "--content-file", "-"}),
         "<m/>",
         ZARLResponse("Vol&ume", "Mount", "<cli>", "17", "/shares/a/", "d\"o's", "ok", "a\tb",
                      "<m/>")
                 .str() +
             kDelimiter},
        // The reason is taken literally: no printf conversion happens.
        {Cmd({"failed"}, {"--message", "100% %s %n \"busy\""}), "",
         ZARLFailedResponse("Vol&ume", "Mount", "<cli>", "17", "/shares/a/", "d\"o's",
                            std::string("100% %s %n \"busy\""))
             .str()},
    };
    for (const Case& c : cases) {
        SCOPED_TRACE(testing::PrintToString(c.args));
        const Result result = Zarl(c.args, c.input);
        EXPECT_EQ(result.status, 0) << result.err;
        EXPECT_EQ(result.out, c.expected);
        EXPECT_EQ(result.err, "");
    }
}

TEST(ToolTest, ErrorsAreOneLineWithTheirExitStatus) {
    struct Case {
        Strings args;
        int status;         // 2: a usage error, 1: a runtime error
        std::string cause;  // what the line must name
    };
    const std::vector<Case> cases = {
        {{}, 2, "subcommand"},
        {{"frobnicate"}, 2, "frobnicate"},
        {{"request", "--bogus"}, 2, "--bogus"},
        {{"request", "--content", "x", "--item", "y"}, 2, "excludes"},
        {{"request", "--content", "x", "--content-file", "f"}, 2, "excludes"},
        {{"failed", "--format", "%s"}, 2, "--format"},
        {{"listen", "--count", "0"}, 2, "--count"},
        {{"listen", "--fields", "--json"}, 2, "excludes"},
        {{"listen", "--port", "http"}, 2, "--port"},
        {{"decode", "a", "b"}, 2, "b"},
        {{"notify", "--item", "x"}, 2, "--item"},
        {{"request", "--content-file", "/nonexistent/c.xml"}, 1, "/nonexistent/c.xml"},
        {{"response", "--path", std::string("a\x01")}, 1, "--path"},
        {{"decode", "/nonexistent/stream"}, 1, "/nonexistent/stream"},
        {{"notify", "--name", std::string("\x02")}, 1, "--name"},
        {{"notify", "--content", std::string(65507 - 126 + 1, 'x')}, 1, "65507"},
    };
    for (const Case& c : cases) {
        SCOPED_TRACE(testing::PrintToString(c.args));
        const Result result = Zarl(c.args);
        EXPECT_EQ(result.status, c.status);
        ExpectOneErrorLine(result);
        EXPECT_NE(result.err.find(c.cause), std::string::npos) << result.err;
    }
}

TEST(ToolTest, ListenOnATakenPortFailsWithOneClearLine) {
    NotificationListener holder(0);
    const std::string address = "127.0.0.1:" + std::to_string(holder.GetPort());
    const Result result = Zarl({"listen", "--port", std::to_string(holder.GetPort())});
    EXPECT_EQ(result.status, 1);
    ExpectOneErrorLine(result);
    EXPECT_NE(result.err.find(address + " is already in use"), std::string::npos) << result.err;
}

TEST(ToolTest, InformationCommands) {
    struct Case {
        Strings args;
        Strings env;
        std::string expected;
    };
    const std::vector<Case> cases = {
        {{"--version"}, {}, std::string("zarl ") + ZARL_VERSION + "\n"},
        {{"home", "--default", "/opt/zarl"}, {}, "/opt/zarl\n"},
        {{"home", "--default", "/opt/zarl"}, {"ZARL_HOME="}, "\n"},
        {{"home"}, {"ZARL_HOME= /srv/zarl/ "}, " /srv/zarl/ \n"},
        {{"endpoints"},
         {},
         "ZARL_NOTIFICATION_SOCKET=" + ZARL_NOTIFICATION_SOCKET + "\nZARL_DISPATCHER_PIPE=" +
             ZARL_DISPATCHER_PIPE + "\nZARL_REQUEST_SOCKET=" + ZARL_REQUEST_SOCKET +
             "\nZARL_NOTIFICATION_PORT=23457\nZARL_MESSAGE_DELIMITER_HEX=00000000\n"
             "ZARL_MESSAGE_DELIMITER_LENGTH=4\n"},
    };
    for (const Case& c : cases) {
        SCOPED_TRACE(testing::PrintToString(c.args));
        const Result result = Zarl(c.args, "", c.env);
        EXPECT_EQ(result.status, 0);
        EXPECT_EQ(result.out, c.expected);
    }
    for (const char* command :
         {"request", "response", "failed", "notify", "listen", "decode", "home", "endpoints"}) {
        const Result result = Zarl({command, "--help"});
        EXPECT_EQ(result.status, 0);
        EXPECT_NE(result.out.find("\nExample:\n  zarl "), std::string::npos) << result.out;
    }
}

TEST(ToolTest, NotifyAndListenInEachFormat) {
    const std::string raw =
        R"(<?xml version="1.0" encoding="UTF-8"?><ZARLNotification Subsystem = "A&amp;B")"
        R"( Name = "Mounted" MountPoint = "/shares/a" Path = "d&#9;x"><n>1</n></ZARLNotification>)";
    const std::vector<std::pair<std::string, std::string>> formats = {
        {"", raw + "\n"},
        {"--fields",
         "kind=notification\nSubsystem=A&B\nName=Mounted\nMountPoint=/shares/a\nPath=d\\tx\n"
         "content=<n>1</n>\n\n"},
        {"--json", R"({"kind":"notification","attributes":{"Subsystem":"A&B","Name":"Mounted",)"
                   R"("MountPoint":"/shares/a","Path":"d\tx"},"content":"<n>1</n>"})"
                   "\n"},
    };
    for (const auto& [format, expected] : formats) {
        SCOPED_TRACE(format);
        Strings args = {kTool, "listen", "--count", "1", "--timeout", "60"};
        if (!format.empty()) {
            args.push_back(format);
        }
        ChildProcess listener(args);
        ASSERT_TRUE(listener.WaitForStderr("zarl: listening on 127.0.0.1:23457\n"));
        const Result notify =
            Zarl({"notify", "--subsystem", "A&B", "--name", "Mounted", "--mount-point",
                  "/shares/a/", "--path", "d\tx", "--content-file", "-"},
                 "<n>1</n>");
        EXPECT_EQ(notify.status, 0) << notify.err;
        EXPECT_EQ(notify.out, "");
        const Result listened = listener.Wait();
        EXPECT_EQ(listened.status, 0) << listened.err;
        EXPECT_EQ(listened.out, expected);
    }
}

TEST(ToolTest, DecodeSplitsAFramedStreamInEachFormat) {
    // Two texts written by --framed, with a message that is no XML between them.
    const std::string first = Zarl({"request", "--framed", "--subsystem", "V", "--request-name",
                                    "Mount", "--path", "a\nb", "--content", "<o/>"})
                                  .out;
    const std::string second = Zarl({"failed", "--framed", "--subsystem", "V", "--request-name",
                                     "Mount", "--message", "no \"way\""})
                                   .out;
    const std::string stream = first + "<not xml" + kDelimiter + second;
    const std::string file =
        testing::TempDir() + "zarl-decode-stream-" + std::to_string(::getpid());
    WriteFile(file, stream);
    const std::string requestText = first.substr(0, first.size() - kDelimiter.size());
    const std::string failedText = second.substr(0, second.size() - kDelimiter.size());

    const std::vector<std::pair<Strings, std::string>> cases = {
        {{"decode", file}, requestText + "\n" + failedText + "\n"},
        {{"decode", "--fields", "-"},
         "kind=request\nSubsystem=V\nRequestName=Mount\nRequester=\nSequenceNumber=\n"
         "MountPoint=\nPath=a\\nb\ncontent=<o/>\n\n"
         "kind=response\nSubsystem=V\nRequestName=Mount\nRequester=\nSequenceNumber=\n"
         "MountPoint=\nPath=\nStatus=failed\nMessage=no \"way\"\ncontent=\n\n"},
        {{"decode", "--json", file},
         R"({"kind":"request","attributes":{"Subsystem":"V","RequestName":"Mount",)"
         R"("Requester":"","SequenceNumber":"","MountPoint":"","Path":"a\nb"},"content":"<o/>"})"
         "\n"
         R"({"kind":"response","attributes":{"Subsystem":"V","RequestName":"Mount",)"
         R"("Requester":"","SequenceNumber":"","MountPoint":"","Path":"","Status":"failed",)"
         R"("Message":"no \"way\""},"content":""})"
         "\n"},
    };
    for (const auto& [args, expected] : cases) {
        SCOPED_TRACE(testing::PrintToString(args));
        const Result result = Zarl(args, stream);
        EXPECT_EQ(result.out, expected);
        // The bad message is reported and skipped; decoding goes on.
        EXPECT_EQ(result.status, 1);
        EXPECT_EQ(result.err.rfind("zarl: message 2: ", 0), 0u) << result.err;
        EXPECT_EQ(result.err.find('\n'), result.err.size() - 1) << result.err;
    }
    std::remove(file.c_str());
}

// A console example of the README: the commands (lines after "$ ", with their
// continuation lines) as one bash script, and the output the README shows.
struct Session {
    int line = 0;
    std::string script;
    std::string expected;
};

std::vector<Session> ReadmeSessions() {
    std::istringstream readme(ReadFile(ZARL_README));
    std::vector<Session> sessions;
    std::string line;
    bool inBlock = false;
    bool continued = false;
    for (int number = 1; std::getline(readme, line); ++number) {
        if (!inBlock) {
            inBlock = line == "```console";
            if (inBlock) {
                sessions.push_back({number, "ready=$(mktemp -p .)\n", ""});
            }
            continue;
        }
        Session& session = sessions.back();
        if (line == "```") {
            inBlock = false;
        } else if (continued || line.rfind("$ ", 0) == 0) {
            std::string command = continued ? line : line.substr(2);
            continued = !command.empty() && command.back() == '\\';
            if (!continued && command.size() > 2 && command.substr(command.size() - 2) == " &") {
                // A listener in the background: wait for its ready line, as a person
                // at the terminal would.
                command = command.substr(0, command.size() - 1) +
                          "2>\"$ready\" &\nuntil grep -q 'listening on' \"$ready\"; do "
                          "kill -0 $! || exit 1; sleep 0.05; done";
            }
            session.script += command + "\n";
        } else {
            session.expected += line + "\n";
        }
    }
    return sessions;
}

TEST(ToolTest, ReadmeConsoleExamplesPrintWhatTheReadmeShows) {
    const std::vector<Session> sessions = ReadmeSessions();
    ASSERT_GE(sessions.size(), 5u);
    const std::string path = "PATH=" + kTool.substr(0, kTool.rfind('/')) + ":" + getenv("PATH");
    for (const Session& session : sessions) {
        SCOPED_TRACE("README.md line " + std::to_string(session.line) + ":\n" + session.script);
        const Result result =
            ChildProcess({"/bin/bash", "-euo", "pipefail", "-c", session.script}, "", {path})
                .Wait();
        EXPECT_EQ(result.status, 0) << result.err;
        EXPECT_EQ(result.out, session.expected) << result.err;
    }
}

}  // namespace

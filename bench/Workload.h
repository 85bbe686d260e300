#pragma once

// The values every benchmark works on: what a requester, a subsystem and a notifier
// typically pass. None holds a byte that needs escaping, so the encoded value equals
// the value and the baselines can append the values as they are.

#include <list>
#include <string>
#include <string_view>

namespace zarl::bench {

struct RequestValues {
    std::string subsystem = "Volume";
    std::string requestName = "Mount";
    std::string requester = "zarl-cli[4711]";
    std::string sequenceNumber = "1042";
    std::string mountPoint = "/shares/projects";
    std::string path = "docs/reports/2024/q3.txt";
    std::string status = "ok";
    std::string message = "mounted read-write";
    std::string content = R"(<Option Name="readonly" Value="false"/>)";
    std::list<std::string> items = {R"(<Item Name="quota" Value="10G"/>)",
                                    R"(<Item Name="owner" Value="build"/>)",
                                    R"(<Item Name="mode" Value="0750"/>)"};
    // GetStatus items: further attributes of the start tag, the last one ending it.
    std::list<std::string> statusItems = {R"( Free = "1073741824")", R"( Used = "52428800">)"};
    // The same attributes as name/value pairs, for writers that build attributes.
    std::string freeValue = "1073741824";
    std::string usedValue = "52428800";
    // Format form of a failed response, and the reason it formats to.
    const char* failedFormat = "mount point %s is busy (error %d)";
    int failedCode = 16;
};

struct NotificationValues {
    std::string subsystem = "Volume";
    std::string name = "Mounted";
    std::string mountPoint = "/shares/projects/";  // Notify drops the trailing slash
    std::string path = "docs/reports/2024/";
    std::string content = R"(<Size Bytes="4096"/>)";
};

// The pieces the message texts are made of.
inline constexpr std::string_view kDeclaration = R"(<?xml version="1.0" encoding="UTF-8"?>)";

// The notification text that the library sends for `v` with `content`, built by plain
// appends (the values need no escaping). The raw delivery loop sends these bytes.
inline std::string NotificationText(const NotificationValues& v, const std::string& content) {
    auto trimmed = [](const std::string& s) {
        return s.size() > 1 && s.back() == '/' ? s.substr(0, s.size() - 1) : s;
    };
    std::string text;
    text.append(kDeclaration)
        .append(R"(<ZARLNotification Subsystem = ")")
        .append(v.subsystem)
        .append(R"(" Name = ")")
        .append(v.name)
        .append(R"(" MountPoint = ")")
        .append(trimmed(v.mountPoint))
        .append(R"(" Path = ")")
        .append(trimmed(v.path))
        .append(R"(">)")
        .append(content)
        .append("</ZARLNotification>");
    return text;
}

}  // namespace zarl::bench

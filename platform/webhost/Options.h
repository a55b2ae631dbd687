// The dev host's command line.
#pragma once

#include <cstdint>
#include <optional>
#include <string>
#include <vector>

namespace qel::webhost {

struct Options {
    std::string listenAddress = "127.0.0.1";
    uint16_t listenPort = 8080;
    std::string shareDir;
    std::string pluginPath;
    /// Limit of a request body, uploads included.
    uint64_t maxBody = 16u * 1024u * 1024u;
    uint32_t maxConnections = 64;
    /// NAME:PASSWORD for the privileged mappings; empty: a random password.
    std::string user;
    std::string encryptionKeyFile;
    /// Prints each uploaded file as it is handed to the plug-in.
    bool traceUploads = false;
    /// Enables the plug-in-free route that benchmarks compare against.
    bool benchFloor = false;
    bool help = false;
};

/// Parses argv (without the program name). Throws std::invalid_argument
/// with a message for the user.
Options ParseOptions(const std::vector<std::string>& args);

const char* Usage();

}  // namespace qel::webhost

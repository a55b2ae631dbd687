// The dev host's command line: parsing and usage text.
#include "Options.h"

#include <charconv>
#include <stdexcept>

namespace qel::webhost {

namespace {

uint64_t ParseUnsigned(const std::string& option, const std::string& text, uint64_t max) {
    uint64_t value = 0;
    auto [end, ec] = std::from_chars(text.data(), text.data() + text.size(), value);
    if (ec != std::errc() || end != text.data() + text.size() || text.empty() || value > max)
        throw std::invalid_argument(option + ": not a number up to " + std::to_string(max) + ": '" + text + "'");
    return value;
}

void ParseListen(const std::string& text, Options& options) {
    size_t colon = text.rfind(':');
    if (colon == std::string::npos) throw std::invalid_argument("--listen: expected ADDR:PORT, got '" + text + "'");
    std::string address = text.substr(0, colon);
    // An IPv6 address is written in brackets so that its colons stay apart
    // from the port's.
    if (address.size() >= 2 && address.front() == '[' && address.back() == ']')
        address = address.substr(1, address.size() - 2);
    if (address.empty()) throw std::invalid_argument("--listen: empty address in '" + text + "'");
    options.listenAddress = address;
    options.listenPort = static_cast<uint16_t>(ParseUnsigned("--listen", text.substr(colon + 1), 65535));
}

}  // namespace

Options ParseOptions(const std::vector<std::string>& args) {
    Options options;
    for (size_t i = 0; i < args.size(); ++i) {
        const std::string& arg = args[i];
        // Both "--name VALUE" and "--name=VALUE".
        std::string name = arg;
        std::optional<std::string> inlineValue;
        if (size_t eq = arg.find('='); arg.rfind("--", 0) == 0 && eq != std::string::npos) {
            name = arg.substr(0, eq);
            inlineValue = arg.substr(eq + 1);
        }
        auto value = [&]() -> std::string {
            if (inlineValue) return *inlineValue;
            if (i + 1 >= args.size()) throw std::invalid_argument(name + ": missing value");
            return args[++i];
        };
        if (name == "--listen") {
            ParseListen(value(), options);
        } else if (name == "--share-dir") {
            options.shareDir = value();
        } else if (name == "--plugin") {
            options.pluginPath = value();
        } else if (name == "--max-body") {
            options.maxBody = ParseUnsigned(name, value(), UINT64_MAX / 2);
        } else if (name == "--max-connections") {
            options.maxConnections = static_cast<uint32_t>(ParseUnsigned(name, value(), 4096));
            if (options.maxConnections == 0) throw std::invalid_argument("--max-connections: must be at least 1");
        } else if (name == "--user") {
            options.user = value();
            size_t colon = options.user.find(':');
            if (colon == std::string::npos || colon == 0 || colon + 1 == options.user.size())
                throw std::invalid_argument("--user: expected NAME:PASSWORD, both non-empty");
        } else if (name == "--encryption-key-file") {
            options.encryptionKeyFile = value();
        } else if (name == "--trace-uploads" && !inlineValue) {
            options.traceUploads = true;
        } else if (name == "--bench-floor" && !inlineValue) {
            options.benchFloor = true;
        } else if ((name == "--help" || name == "-h") && !inlineValue) {
            options.help = true;
        } else {
            throw std::invalid_argument("unknown option '" + arg + "' (try --help)");
        }
    }
    return options;
}

const char* Usage() {
    return "usage: qelwebhost [options]\n"
           "  --listen ADDR:PORT           address to serve (default 127.0.0.1:8080; port 0 picks a free one)\n"
           "  --share-dir DIR              shared data directory for the plug-in (QELSHAREDDIR);\n"
           "                               default: the simulated device of the build tree\n"
           "  --plugin PATH                the plug-in to load (default: the one built with this host)\n"
           "  --max-body BYTES             largest request body, uploads included (default 16 MiB)\n"
           "  --max-connections N          simultaneous connections, one thread each (default 64)\n"
           "  --user NAME:PASSWORD         credentials of ServerAuthenticated and ServerFirmware;\n"
           "                               default: user 'qel' with a random password printed at start\n"
           "  --encryption-key-file FILE   32 raw bytes: the key of encrypted form data\n"
           "  --trace-uploads              print each uploaded file handed to the plug-in (stderr)\n"
           "  --bench-floor                serve /bench/floor?bytes=N, the host without the plug-in\n";
}

}  // namespace qel::webhost

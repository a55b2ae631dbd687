// qelwebhost: loads the plug-in as the controller's web server does and
// serves it over HTTP until SIGINT or SIGTERM.
#include <dlfcn.h>
#include <errno.h>
#include <fcntl.h>
#include <openssl/rand.h>
#include <signal.h>
#include <stdlib.h>
#include <unistd.h>

#include <cstdio>
#include <cstring>
#include <exception>
#include <stdexcept>
#include <string>
#include <vector>

#include "Options.h"
#include "WebHost.h"

namespace {

using qel::webhost::EncryptKey;
using qel::webhost::Options;

struct Plugin {
    void* handle = nullptr;
    void (*init)() = nullptr;
    qel::webhost::RunFn run = nullptr;
    void (*finalize)() = nullptr;
};

void* Symbol(void* handle, const char* name) {
    void* address = dlsym(handle, name);
    if (!address) throw std::runtime_error(std::string("the plug-in lacks ") + name);
    return address;
}

Plugin LoadPlugin(const std::string& path) {
    Plugin plugin;
    plugin.handle = dlopen(path.c_str(), RTLD_NOW | RTLD_LOCAL);
    if (!plugin.handle) throw std::runtime_error(std::string("cannot load the plug-in: ") + dlerror());
    plugin.init = reinterpret_cast<void (*)()>(Symbol(plugin.handle, "qelsysapiInit"));
    plugin.run = reinterpret_cast<qel::webhost::RunFn>(Symbol(plugin.handle, "qelsysapiRun"));
    plugin.finalize = reinterpret_cast<void (*)()>(Symbol(plugin.handle, "qelsysapiFinalize"));
    return plugin;
}

EncryptKey ReadKeyFile(const std::string& path) {
    int fd = open(path.c_str(), O_RDONLY | O_CLOEXEC);
    if (fd < 0) throw std::runtime_error("cannot open " + path + ": " + std::strerror(errno));
    EncryptKey key{};
    size_t got = 0;
    unsigned char extra = 0;
    ssize_t n = 0;
    while (got < key.size()) {
        n = read(fd, key.data() + got, key.size() - got);
        if (n < 0 && errno == EINTR) continue;
        if (n <= 0) break;
        got += static_cast<size_t>(n);
    }
    do {
        n = read(fd, &extra, 1);
    } while (n < 0 && errno == EINTR);
    close(fd);
    if (got != key.size() || n != 0)
        throw std::runtime_error(path + ": an encryption key file holds exactly 32 raw bytes");
    return key;
}

std::string RandomPassword() {
    unsigned char bytes[12];
    if (RAND_bytes(bytes, sizeof bytes) != 1) throw std::runtime_error("no random bytes for a password");
    static const char kAlphabet[] = "abcdefghijkmnpqrstuvwxyzABCDEFGHJKLMNPQRSTUVWXYZ23456789";
    std::string password;
    // 56 letters: the small bias of the modulo does not matter for 12 picks.
    for (unsigned char b : bytes) password += kAlphabet[b % (sizeof kAlphabet - 1)];
    return password;
}

int Serve(const Options& options) {
    qel::webhost::WebHostConfig config;
    config.listenAddress = options.listenAddress;
    config.listenPort = options.listenPort;
    config.maxConnections = options.maxConnections;
    config.maxBody = options.maxBody;
    config.traceUploads = options.traceUploads;
    config.benchFloor = options.benchFloor;
    bool generated = options.user.empty();
    if (generated) {
        config.userName = "qel";
        config.password = RandomPassword();
    } else {
        size_t colon = options.user.find(':');
        config.userName = options.user.substr(0, colon);
        config.password = options.user.substr(colon + 1);
    }
    if (!options.encryptionKeyFile.empty()) config.encryptKey = ReadKeyFile(options.encryptionKeyFile);

    // Requests and the plug-in's own threads must not take the shutdown
    // signals: the main thread waits for them. Threads inherit this mask.
    sigset_t stopSignals;
    sigemptyset(&stopSignals);
    sigaddset(&stopSignals, SIGINT);
    sigaddset(&stopSignals, SIGTERM);
    pthread_sigmask(SIG_BLOCK, &stopSignals, nullptr);
    signal(SIGPIPE, SIG_IGN);

    const char* tmp = std::getenv("TMPDIR");
    std::string pattern = std::string(tmp && *tmp ? tmp : "/tmp") + "/qelwebhost-XXXXXX";
    if (!mkdtemp(pattern.data())) throw std::runtime_error("cannot create the upload directory: " + pattern);
    config.uploadDir = pattern;  // mkdtemp creates it with mode 0700

    std::string shareDir = options.shareDir.empty() ? QEL_WEBHOST_DEFAULT_SHARE_DIR : options.shareDir;
    setenv("QELSHAREDDIR", shareDir.c_str(), 1);
    Plugin plugin = LoadPlugin(options.pluginPath.empty() ? QEL_WEBHOST_DEFAULT_PLUGIN : options.pluginPath);
    config.run = plugin.run;
    plugin.init();

    int exitCode = 0;
    {
        qel::webhost::WebHost host(config);
        try {
            host.Start();
        } catch (const std::exception& e) {
            std::fprintf(stderr, "qelwebhost: %s\n", e.what());
            exitCode = 1;
        }
        if (exitCode == 0) {
            std::string shown = options.listenAddress.find(':') != std::string::npos
                                    ? "[" + options.listenAddress + "]"
                                    : options.listenAddress;
            std::printf("qelwebhost: share directory %s\n", shareDir.c_str());
            if (generated)
                std::printf("qelwebhost: privileged mappings: user '%s', generated password '%s'\n",
                            config.userName.c_str(), config.password.c_str());
            // Tests and scripts wait for this line; it comes last.
            std::printf("qelwebhost: listening on http://%s:%u/\n", shown.c_str(), unsigned(host.Port()));
            std::fflush(stdout);
            int signalNumber = 0;
            while (sigwait(&stopSignals, &signalNumber) != 0) {
            }
            std::fprintf(stderr, "qelwebhost: %s received, stopping\n", strsignal(signalNumber));
        }
        host.Stop();
    }
    plugin.finalize();
    std::fprintf(stderr, "qelwebhost: plug-in finalised\n");
    rmdir(config.uploadDir.c_str());
    return exitCode;
}

}  // namespace

int main(int argc, char** argv) {
    try {
        Options options = qel::webhost::ParseOptions(std::vector<std::string>(argv + 1, argv + argc));
        if (options.help) {
            std::fputs(qel::webhost::Usage(), stdout);
            return 0;
        }
        return Serve(options);
    } catch (const std::exception& e) {
        std::fprintf(stderr, "qelwebhost: %s\n", e.what());
        return 2;
    }
}

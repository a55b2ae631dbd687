// The HTTP side of the dev host: serves the plug-in's mappings over
// libmicrohttpd, one thread per connection.
#pragma once

#include <array>
#include <cstdint>
#include <memory>
#include <optional>
#include <string>

#include "Crypto.h"

namespace qel::webhost {

class RequestMapping;

/// The plug-in's request entry point, as loaded from it.
using RunFn = void (*)(RequestMapping*, void*);

struct WebHostConfig {
    std::string listenAddress;
    uint16_t listenPort = 0;
    uint32_t maxConnections = 64;
    uint64_t maxBody = 0;
    RunFn run = nullptr;
    /// Credentials of the privileged mappings.
    std::string userName;
    std::string password;
    /// The key the runtime offers for encrypted form data, if any.
    std::optional<EncryptKey> encryptKey;
    /// Where uploads are stored while their request runs (a private directory).
    std::string uploadDir;
    bool traceUploads = false;
    bool benchFloor = false;
};

/// A running server. Requests may arrive as soon as Start returns; the
/// plug-in must be initialised before and finalised only after Stop.
class WebHost {
public:
    explicit WebHost(WebHostConfig config);
    ~WebHost();
    WebHost(const WebHost&) = delete;
    WebHost& operator=(const WebHost&) = delete;

    /// Throws std::runtime_error when the address cannot be served.
    void Start();
    /// The bound port (useful when 0 was asked for).
    uint16_t Port() const;
    /// Closes the listening socket and waits for every request to end.
    void Stop() noexcept;

    struct Impl;

private:
    std::unique_ptr<Impl> impl_;
};

}  // namespace qel::webhost

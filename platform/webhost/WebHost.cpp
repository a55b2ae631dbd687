// The dev host's HTTP server: routing, authentication, body limits, form and
// upload decoding into a runtime Request, the plug-in call and the access log.
#include "WebHost.h"

#include <arpa/inet.h>
#include <errno.h>
#include <fcntl.h>
#include <microhttpd.h>
#include <netinet/in.h>
#include <openssl/crypto.h>
#include <openssl/evp.h>
#include <stdlib.h>
#include <string.h>
#include <sys/socket.h>
#include <unistd.h>

#include <algorithm>
#include <chrono>
#include <cstdio>
#include <stdexcept>
#include <string>
#include <string_view>
#include <vector>

#include "Request.h"
#include "service/WebhostRuntime.h"

namespace qel::webhost {

namespace {

constexpr std::string_view kMappingPrefix = "/qelsysapi/";
constexpr std::string_view kFloorPath = "/bench/floor";
constexpr const char* kRealm = "qelsysapi";
// Enough for a large catalogue answer; a larger floor document is refused.
constexpr size_t kMaxFloorBytes = 1u << 20;
constexpr size_t kPostBufferSize = 16 * 1024;
// Named MHD_HTTP_PAYLOAD_TOO_LARGE or MHD_HTTP_CONTENT_TOO_LARGE depending
// on the library's version.
constexpr unsigned kPayloadTooLarge = 413;

// The mapping object handed to the plug-in: its name exactly as written in
// the path.
class HostMapping : public RequestMapping {
public:
    explicit HostMapping(std::string_view name) {
        std::wstring path(L"/qelsysapi/");
        std::wstring wide(name.begin(), name.end());  // ASCII, checked by the router
        path += wide;
        path_ = fnd::WString(path.c_str(), static_cast<uint32_t>(path.size()));
        name_ = fnd::WString(wide.c_str(), static_cast<uint32_t>(wide.size()));
    }
    const fnd::WString& MappingPath() const override { return path_; }
    const fnd::WString& MappingName() const override { return name_; }

private:
    fnd::WString path_;
    fnd::WString name_;
};

enum class Route { kNone, kPlugin, kFloor };

// Mapping names are identifiers. Refusing anything else keeps the host's
// check of the privileged names and the plug-in's case-insensitive routing
// (which maps some non-ASCII letters onto ASCII ones) in agreement.
bool IsMappingName(std::string_view name) {
    if (name.empty()) return false;
    return std::all_of(name.begin(), name.end(), [](char c) {
        return (c >= 'a' && c <= 'z') || (c >= 'A' && c <= 'Z') || (c >= '0' && c <= '9') || c == '_' || c == '-' ||
               c == '.';
    });
}

bool EqualsIgnoringAsciiCase(std::string_view a, std::string_view b) {
    if (a.size() != b.size()) return false;
    for (size_t i = 0; i < a.size(); ++i) {
        auto lower = [](char c) { return (c >= 'A' && c <= 'Z') ? static_cast<char>(c - 'A' + 'a') : c; };
        if (lower(a[i]) != lower(b[i])) return false;
    }
    return true;
}

bool IsPrivilegedMapping(std::string_view name) {
    return EqualsIgnoringAsciiCase(name, "ServerAuthenticated") || EqualsIgnoringAsciiCase(name, "ServerFirmware");
}

// Hashing both sides first makes the comparison independent of where, and
// whether, the lengths differ.
std::array<unsigned char, 32> Digest(std::string_view text) {
    std::array<unsigned char, 32> digest{};
    unsigned int length = 0;
    if (!EVP_Digest(text.data(), text.size(), digest.data(), &length, EVP_sha256(), nullptr))
        throw std::runtime_error("SHA-256 failed");
    return digest;
}

// Access-log fields come from the client: control characters and quotes are
// escaped so that one request stays one line.
std::string Printable(std::string_view text, size_t limit = 200) {
    std::string out;
    for (unsigned char c : text.substr(0, limit)) {
        if (c < 0x20 || c >= 0x7F || c == '"' || c == '\\') {
            char hex[5];
            std::snprintf(hex, sizeof hex, "\\x%02X", c);
            out += hex;
        } else {
            out += static_cast<char>(c);
        }
    }
    if (text.size() > limit) out += "...";
    return out;
}

int HexValue(char c) {
    if (c >= '0' && c <= '9') return c - '0';
    if (c >= 'a' && c <= 'f') return c - 'a' + 10;
    if (c >= 'A' && c <= 'F') return c - 'A' + 10;
    return -1;
}

std::string UrlDecodePiece(std::string_view piece) {
    std::string out;
    for (size_t i = 0; i < piece.size(); ++i) {
        if (piece[i] == '+') {
            out += ' ';
        } else if (piece[i] == '%' && i + 2 < piece.size() && HexValue(piece[i + 1]) >= 0 &&
                   HexValue(piece[i + 2]) >= 0) {
            out += static_cast<char>(HexValue(piece[i + 1]) * 16 + HexValue(piece[i + 2]));
            i += 2;
        } else {
            out += piece[i];
        }
    }
    return out;
}

// The "Function" argument for the access log, from the fields as the
// plug-in will read them.
std::string FunctionOf(const Request& request) {
    for (const Request::FormField& field : request.FormFields()) {
        if (field.key.rfind("encrypted_data", 0) == 0) return "(encrypted)";
        if (EqualsIgnoringAsciiCase(field.key, "Function")) return field.value;
        if (field.key.rfind("form_data", 0) != 0) continue;
        std::string_view form = field.value;
        while (!form.empty()) {
            size_t amp = form.find('&');
            std::string_view pair = form.substr(0, amp);
            size_t eq = pair.find('=');
            if (eq != std::string_view::npos && EqualsIgnoringAsciiCase(UrlDecodePiece(pair.substr(0, eq)), "Function"))
                return UrlDecodePiece(pair.substr(eq + 1));
            if (amp == std::string_view::npos) break;
            form.remove_prefix(amp + 1);
        }
    }
    return {};
}

// The document's "hr" attribute, in either encoding the plug-in writes.
std::string HrOf(const std::string& output) {
    for (bool wide : {false, true}) {
        std::string pattern;
        for (char c : std::string_view("hr='")) {
            pattern += c;
            if (wide) pattern += '\0';
        }
        size_t at = output.find(pattern);
        if (at == std::string::npos) continue;
        std::string hr;
        for (size_t i = at + pattern.size(); i < output.size() && hr.size() < 8; i += wide ? 2 : 1) {
            if (HexValue(output[i]) < 0) break;
            hr += output[i];
        }
        return hr;
    }
    return {};
}

std::string Sha256Hex(int fd) {
    EVP_MD_CTX* ctx = EVP_MD_CTX_new();
    if (!ctx) return "?";
    EVP_DigestInit_ex(ctx, EVP_sha256(), nullptr);
    char buffer[8192];
    for (;;) {
        ssize_t n = read(fd, buffer, sizeof buffer);
        if (n < 0 && errno == EINTR) continue;
        if (n <= 0) break;
        EVP_DigestUpdate(ctx, buffer, static_cast<size_t>(n));
    }
    unsigned char digest[32];
    unsigned int length = 0;
    EVP_DigestFinal_ex(ctx, digest, &length);
    EVP_MD_CTX_free(ctx);
    std::string hex;
    for (unsigned int i = 0; i < length; ++i) {
        char pair[3];
        std::snprintf(pair, sizeof pair, "%02x", digest[i]);
        hex += pair;
    }
    return hex;
}

}  // namespace

struct WebHost::Impl {
    WebHostConfig config;
    std::array<unsigned char, 32> credentialDigest{};
    std::string floorDocument;
    MHD_Daemon* daemon = nullptr;
    uint16_t port = 0;
};

namespace {

// Everything one HTTP request owns while libmicrohttpd calls us for it.
struct Exchange {
    WebHost::Impl* host = nullptr;
    std::chrono::steady_clock::time_point start = std::chrono::steady_clock::now();
    std::string method;
    std::string path;
    Route route = Route::kNone;
    std::string mappingName;
    bool responded = false;
    unsigned status = 0;
    uint64_t bodyBytes = 0;
    bool tooLarge = false;
    bool badBody = false;
    bool storageFailed = false;
    MHD_PostProcessor* postProcessor = nullptr;
    Request request{""};
    // The field or file that the post processor is filling.
    bool inFile = false;
    int fileFd = -1;
    std::vector<std::string> localFiles;
    std::vector<Request::FormField> fields;
    std::vector<Request::UploadedFile> uploads;
    std::string function;
    std::string hr;
    size_t sentBytes = 0;

    ~Exchange() {
        if (postProcessor) MHD_destroy_post_processor(postProcessor);
        if (fileFd >= 0) close(fileFd);
        for (const std::string& file : localFiles) unlink(file.c_str());
    }
};

MHD_Result Queue(Exchange& ex, MHD_Connection* connection, unsigned status, std::string_view body,
                 const char* contentType) {
    MHD_Response* response =
        MHD_create_response_from_buffer(body.size(), const_cast<char*>(body.data()), MHD_RESPMEM_MUST_COPY);
    if (!response) return MHD_NO;
    if (contentType) MHD_add_response_header(response, MHD_HTTP_HEADER_CONTENT_TYPE, contentType);
    if (status == MHD_HTTP_METHOD_NOT_ALLOWED) MHD_add_response_header(response, MHD_HTTP_HEADER_ALLOW, "GET, POST");
    MHD_Result result = status == MHD_HTTP_UNAUTHORIZED
                            ? MHD_queue_basic_auth_fail_response(connection, kRealm, response)
                            : MHD_queue_response(connection, status, response);
    MHD_destroy_response(response);
    ex.responded = true;
    ex.status = status;
    ex.sentBytes = body.size();
    return result;
}

MHD_Result QueueText(Exchange& ex, MHD_Connection* connection, unsigned status, std::string_view text) {
    return Queue(ex, connection, status, text, "text/plain; charset=utf-8");
}

bool Authenticated(WebHost::Impl& host, MHD_Connection* connection) {
    char* password = nullptr;
    char* user = MHD_basic_auth_get_username_password(connection, &password);
    bool ok = false;
    if (user && password) {
        std::string given = std::string(user) + ':' + password;
        std::array<unsigned char, 32> digest = Digest(given);
        OPENSSL_cleanse(given.data(), given.size());
        ok = CRYPTO_memcmp(digest.data(), host.credentialDigest.data(), digest.size()) == 0;
    }
    if (password) {
        OPENSSL_cleanse(password, strlen(password));
        MHD_free(password);
    }
    if (user) MHD_free(user);
    return ok;
}

bool WriteAll(int fd, const char* data, size_t size) {
    while (size > 0) {
        ssize_t n = write(fd, data, size);
        if (n < 0 && errno == EINTR) continue;
        if (n <= 0) return false;
        data += n;
        size -= static_cast<size_t>(n);
    }
    return true;
}

void CloseFile(Exchange& ex) {
    if (ex.fileFd >= 0) close(ex.fileFd);
    ex.fileFd = -1;
}

// Fields are kept in the order received; a field or file longer than the
// processor's buffer arrives in several calls, the later ones at an offset.
MHD_Result OnPostData(void* cls, MHD_ValueKind, const char* key, const char* filename, const char*, const char*,
                      const char* data, uint64_t off, size_t size) {
    auto& ex = *static_cast<Exchange*>(cls);
    try {
        if (filename) {
            if (off == 0) {
                CloseFile(ex);
                std::string pattern = ex.host->config.uploadDir + "/upload-XXXXXX";
                int fd = mkstemp(pattern.data());
                if (fd < 0) {
                    ex.storageFailed = true;
                    return MHD_NO;
                }
                ex.fileFd = fd;
                ex.localFiles.push_back(pattern);
                ex.uploads.push_back({pattern, filename});
                ex.inFile = true;
            }
            if (ex.fileFd < 0 || !WriteAll(ex.fileFd, data, size)) {
                ex.storageFailed = true;
                return MHD_NO;
            }
            return MHD_YES;
        }
        if (off == 0 || ex.inFile || ex.fields.empty()) {
            CloseFile(ex);
            ex.inFile = false;
            ex.fields.push_back({key ? key : "", std::string()});
        }
        if (data) ex.fields.back().value.append(data, size);
        return MHD_YES;
    } catch (...) {
        ex.storageFailed = true;
        return MHD_NO;
    }
}

// Runs once the whole body is in: builds the runtime request, calls the
// plug-in (or the floor) and queues its answer.
MHD_Result Serve(Exchange& ex, MHD_Connection* connection) {
    WebHost::Impl& host = *ex.host;
    if (ex.postProcessor) {
        if (MHD_destroy_post_processor(ex.postProcessor) != MHD_YES) ex.badBody = true;
        ex.postProcessor = nullptr;
    }
    CloseFile(ex);
    if (ex.tooLarge) return QueueText(ex, connection, kPayloadTooLarge, "request body too large\n");
    if (ex.storageFailed) return QueueText(ex, connection, MHD_HTTP_INTERNAL_SERVER_ERROR, "upload not stored\n");
    if (ex.badBody) return QueueText(ex, connection, MHD_HTTP_BAD_REQUEST, "malformed form data\n");

    Request& request = ex.request;
    request.SetMethod(ex.method);
    for (const Request::FormField& field : ex.fields) request.AddFormField(field.key, field.value);
    for (const Request::UploadedFile& file : ex.uploads) request.AddUploadedFile(file.localPath, file.clientName);
    if (const char* type = MHD_lookup_connection_value(connection, MHD_HEADER_KIND, MHD_HTTP_HEADER_CONTENT_TYPE))
        request.SetVariable("CONTENT_TYPE", type);
    for (const char* name : {"items", "loc"}) {
        if (const char* value = MHD_lookup_connection_value(connection, MHD_GET_ARGUMENT_KIND, name))
            request.SetVariable(name, value);
    }
    if (host.config.encryptKey) request.SetEncryptKey(*host.config.encryptKey);
    ex.function = FunctionOf(request);

    if (host.config.traceUploads) {
        for (const Request::UploadedFile& file : request.UploadedFiles()) {
            int fd = open(file.localPath.c_str(), O_RDONLY | O_CLOEXEC);
            off_t size = fd >= 0 ? lseek(fd, 0, SEEK_END) : -1;
            if (fd >= 0) lseek(fd, 0, SEEK_SET);
            std::string sha = fd >= 0 ? Sha256Hex(fd) : "-";
            if (fd >= 0) close(fd);
            std::fprintf(stderr, "qelwebhost: upload local=\"%s\" client=\"%s\" bytes=%lld sha256=%s\n",
                         Printable(file.localPath).c_str(), Printable(file.clientName).c_str(),
                         static_cast<long long>(size), sha.c_str());
        }
    }

    if (ex.route == Route::kFloor) {
        const char* bytes = MHD_lookup_connection_value(connection, MHD_GET_ARGUMENT_KIND, "bytes");
        size_t count = bytes ? std::strtoull(bytes, nullptr, 10) : 0;
        if (count > host.floorDocument.size()) return QueueText(ex, connection, MHD_HTTP_BAD_REQUEST, "too many bytes\n");
        request.SetResponseMimeType("text/xml; charset=utf-16le");
        request.AppendOutput(host.floorDocument.data(), count);
    } else {
        HostMapping mapping(ex.mappingName);
        host.config.run(&mapping, &request);
    }
    if (request.Calls().writeOutput == 0 && ex.route == Route::kPlugin)
        return QueueText(ex, connection, MHD_HTTP_INTERNAL_SERVER_ERROR, "the plug-in wrote no answer\n");
    ex.hr = HrOf(request.Output());
    std::string mime = request.ResponseMimeType();
    return Queue(ex, connection, MHD_HTTP_OK, request.Output(), mime.empty() ? nullptr : mime.c_str());
}

// First call for a request: everything decided from the header alone.
MHD_Result Admit(Exchange& ex, MHD_Connection* connection) {
    WebHost::Impl& host = *ex.host;
    std::string_view path = ex.path;
    if (path.substr(0, kMappingPrefix.size()) == kMappingPrefix && IsMappingName(path.substr(kMappingPrefix.size()))) {
        ex.route = Route::kPlugin;
        ex.mappingName = path.substr(kMappingPrefix.size());
    } else if (host.config.benchFloor && path == kFloorPath) {
        ex.route = Route::kFloor;
    } else {
        return QueueText(ex, connection, MHD_HTTP_NOT_FOUND, "not found\n");
    }
    if (ex.method != "GET" && ex.method != "POST")
        return QueueText(ex, connection, MHD_HTTP_METHOD_NOT_ALLOWED, "method not allowed\n");
    if (ex.route == Route::kPlugin && IsPrivilegedMapping(ex.mappingName) && !Authenticated(host, connection))
        return QueueText(ex, connection, MHD_HTTP_UNAUTHORIZED, "authentication required\n");

    if (const char* length =
            MHD_lookup_connection_value(connection, MHD_HEADER_KIND, MHD_HTTP_HEADER_CONTENT_LENGTH)) {
        char* end = nullptr;
        errno = 0;
        unsigned long long declared = std::strtoull(length, &end, 10);
        if (errno != 0 || declared > host.config.maxBody)
            return QueueText(ex, connection, kPayloadTooLarge, "request body too large\n");
    }
    // Other content types carry no form the plug-in could read; their body
    // is counted against the limit and dropped.
    ex.postProcessor = MHD_create_post_processor(connection, kPostBufferSize, OnPostData, &ex);
    return MHD_YES;
}

MHD_Result OnRequest(void* cls, MHD_Connection* connection, const char* url, const char* method, const char*,
                     const char* uploadData, size_t* uploadDataSize, void** context) {
    auto* host = static_cast<WebHost::Impl*>(cls);
    try {
        auto* ex = static_cast<Exchange*>(*context);
        if (!ex) {
            ex = new Exchange();
            *context = ex;
            ex->host = host;
            ex->method = method ? method : "";
            ex->path = url ? url : "";
            return Admit(*ex, connection);
        }
        if (ex->responded) {
            // Answered from the header; the rest of the body is dropped.
            *uploadDataSize = 0;
            return MHD_YES;
        }
        if (*uploadDataSize > 0) {
            size_t size = *uploadDataSize;
            *uploadDataSize = 0;
            ex->bodyBytes += size;
            if (ex->bodyBytes > host->config.maxBody) {
                // A chunked body over the limit: keep reading (only an answer
                // at the end is possible) but store nothing more; a client
                // that goes on far beyond the limit is cut off.
                ex->tooLarge = true;
                if (ex->bodyBytes > 4 * host->config.maxBody + kPostBufferSize) return MHD_NO;
                return MHD_YES;
            }
            if (ex->postProcessor && !ex->tooLarge && MHD_post_process(ex->postProcessor, uploadData, size) != MHD_YES)
                ex->badBody = true;
            return MHD_YES;
        }
        return Serve(*ex, connection);
    } catch (...) {
        return MHD_NO;
    }
}

void OnCompleted(void*, MHD_Connection*, void** context, MHD_RequestTerminationCode termination) {
    std::unique_ptr<Exchange> ex(static_cast<Exchange*>(*context));
    *context = nullptr;
    if (!ex) return;
    try {
        auto micros = std::chrono::duration_cast<std::chrono::microseconds>(std::chrono::steady_clock::now() - ex->start);
        std::string line = "qelwebhost: " + Printable(ex->method, 16) + " \"" + Printable(ex->path) + "\" function=\"" +
                           Printable(ex->function, 64) + "\" status=" + std::to_string(ex->status) +
                           " hr=" + (ex->hr.empty() ? "-" : ex->hr) + " bytes=" + std::to_string(ex->sentBytes) +
                           " ms=" + std::to_string(micros.count() / 1000) + "." +
                           std::to_string(micros.count() % 1000 / 100) +
                           (termination == MHD_REQUEST_TERMINATED_COMPLETED_OK ? "" : " aborted") + "\n";
        // One write per line keeps lines of concurrent requests apart.
        ssize_t ignored = write(STDERR_FILENO, line.data(), line.size());
        (void)ignored;
    } catch (...) {
    }
}

}  // namespace

WebHost::WebHost(WebHostConfig config) : impl_(std::make_unique<Impl>()) {
    impl_->config = std::move(config);
    impl_->credentialDigest = Digest(impl_->config.userName + ':' + impl_->config.password);
    if (impl_->config.benchFloor) {
        // A document of the plug-in's shape, so the bytes compress and copy
        // alike; only its length matters to the benchmark.
        std::string text;
        while (text.size() < kMaxFloorBytes) text += "<ExpertInfo productVersion='5.0.0' programmaticName='floor' />";
        text.resize(kMaxFloorBytes);
        impl_->floorDocument = std::move(text);
    }
}

WebHost::~WebHost() { Stop(); }

void WebHost::Start() {
    const WebHostConfig& config = impl_->config;
    sockaddr_storage address{};
    socklen_t addressLength = 0;
    unsigned int flags = MHD_USE_THREAD_PER_CONNECTION | MHD_USE_INTERNAL_POLLING_THREAD | MHD_USE_POLL |
                         MHD_USE_ERROR_LOG;
    auto* v4 = reinterpret_cast<sockaddr_in*>(&address);
    auto* v6 = reinterpret_cast<sockaddr_in6*>(&address);
    if (inet_pton(AF_INET, config.listenAddress.c_str(), &v4->sin_addr) == 1) {
        v4->sin_family = AF_INET;
        v4->sin_port = htons(config.listenPort);
        addressLength = sizeof(sockaddr_in);
    } else if (inet_pton(AF_INET6, config.listenAddress.c_str(), &v6->sin6_addr) == 1) {
        v6->sin6_family = AF_INET6;
        v6->sin6_port = htons(config.listenPort);
        addressLength = sizeof(sockaddr_in6);
        flags |= MHD_USE_IPv6;
    } else {
        throw std::runtime_error("not a numeric IPv4 or IPv6 address: " + config.listenAddress);
    }
    (void)addressLength;
    impl_->daemon = MHD_start_daemon(flags, config.listenPort, nullptr, nullptr, OnRequest, impl_.get(),
                                     MHD_OPTION_SOCK_ADDR, reinterpret_cast<sockaddr*>(&address),
                                     MHD_OPTION_CONNECTION_LIMIT, static_cast<unsigned int>(config.maxConnections),
                                     // Longer than a notification wait, so a
                                     // long poll's connection is not reaped.
                                     MHD_OPTION_CONNECTION_TIMEOUT, 60u,
                                     MHD_OPTION_NOTIFY_COMPLETED, OnCompleted, nullptr, MHD_OPTION_END);
    if (!impl_->daemon)
        throw std::runtime_error("cannot serve " + config.listenAddress + ":" + std::to_string(config.listenPort));
    const MHD_DaemonInfo* info = MHD_get_daemon_info(impl_->daemon, MHD_DAEMON_INFO_BIND_PORT);
    impl_->port = info ? info->port : config.listenPort;
}

uint16_t WebHost::Port() const { return impl_->port; }

void WebHost::Stop() noexcept {
    if (impl_ && impl_->daemon) {
        MHD_stop_daemon(impl_->daemon);
        impl_->daemon = nullptr;
    }
}

}  // namespace qel::webhost

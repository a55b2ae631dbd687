// Firmware changes of the simulated device and the thread that carries them out.
#include "Firmware.h"

#include <chrono>
#include <cwchar>
#include <random>

namespace qel::sim {

Firmware::Firmware(const FirmwareSettings& settings)
    : millisecondsPerPercent_(settings.millisecondsPerPercent), running_(settings.version) {}

Firmware::~Firmware() {
    {
        std::lock_guard<std::mutex> guard(lock_);
        stopping_ = true;
    }
    wake_.notify_all();
    if (worker_.joinable()) worker_.join();
}

int32_t Firmware::Begin(uint32_t stopTasks, uint32_t imageLength, std::wstring* detailed) {
    std::lock_guard<std::mutex> guard(lock_);
    if (state_ == kFirmwareWriting || state_ == kFirmwareErasing) {
        *detailed = L"Firmware change refused: a change is still in progress (" + std::to_wstring(percent_) +
                    L"% complete).";
        return kStatusFirmwareBusy;
    }
    // Unpredictable enough that a client cannot guess another's token, and
    // never the same twice within one device.
    std::random_device entropy;
    uint64_t bits = (uint64_t{entropy()} << 32 | entropy()) ^ ++tokensIssued_;
    wchar_t token[32];
    std::swprintf(token, 32, L"FWT-%016llX", static_cast<unsigned long long>(bits));
    token_ = token;
    state_ = kFirmwarePrepared;
    percent_ = 0;
    announcedLength_ = imageLength;
    *detailed = L"Firmware change prepared.\nRequestToken: " + token_ + L"\nImage length: " +
                std::to_wstring(imageLength) + L" bytes\nApplication tasks stopped: " +
                (stopTasks ? L"yes" : L"no") + L"\nRunning version: " + running_;
    return fnd::kStatusOk;
}

int32_t Firmware::Start(const wchar_t* token, FirmwareState state, const std::wstring& target) {
    // Called with lock_ held.
    if (!token) return fnd::kStatusPointer;
    if (state_ != kFirmwarePrepared || token_.empty() || token_ != token) return kStatusBadToken;
    // The previous step finished before this change could be prepared; its
    // thread has nothing left to do but end.
    if (worker_.joinable()) worker_.join();
    token_.clear();
    state_ = state;
    percent_ = 0;
    target_ = target;
    worker_ = std::thread([this] { Advance(); });
    return fnd::kStatusOk;
}

int32_t Firmware::Write(const wchar_t* token, uint32_t overwrite, const std::wstring& version) {
    std::unique_lock<std::mutex> guard(lock_);
    if (token && state_ == kFirmwarePrepared && token_ == token && !overwrite && version == running_)
        return fnd::kStatusFalse;
    return Start(token, kFirmwareWriting, version);
}

int32_t Firmware::Erase(const wchar_t* token) {
    std::unique_lock<std::mutex> guard(lock_);
    return Start(token, kFirmwareErasing, std::wstring());
}

void Firmware::Advance() {
    std::unique_lock<std::mutex> guard(lock_);
    while (!stopping_ && percent_ < 100) {
        wake_.wait_for(guard, std::chrono::milliseconds(millisecondsPerPercent_), [this] { return stopping_; });
        if (stopping_) return;
        ++percent_;
    }
    if (state_ == kFirmwareWriting) {
        pending_ = target_;
        state_ = kFirmwareAwaitingRestart;
    } else {
        running_.clear();
        pending_.clear();
        state_ = kFirmwareErased;
    }
}

void Firmware::Status(uint32_t* state, uint32_t* percent, uint32_t* requiresRestart, std::wstring* version) const {
    std::lock_guard<std::mutex> guard(lock_);
    *state = state_;
    *percent = percent_;
    *requiresRestart = state_ == kFirmwareAwaitingRestart || state_ == kFirmwareErased ? 1 : 0;
    *version = state_ == kFirmwareAwaitingRestart ? pending_ : running_;
}

int32_t Firmware::Restart() {
    std::lock_guard<std::mutex> guard(lock_);
    if (state_ == kFirmwareWriting || state_ == kFirmwareErasing) return kStatusFirmwareBusy;
    if (!pending_.empty()) running_ = pending_;
    pending_.clear();
    token_.clear();
    percent_ = 0;
    // An erased device stays erased: there is nothing to restart into.
    if (state_ != kFirmwareErased) state_ = kFirmwareIdle;
    return fnd::kStatusOk;
}

uint32_t Firmware::AnnouncedLength() const {
    std::lock_guard<std::mutex> guard(lock_);
    return announcedLength_;
}

}  // namespace qel::sim

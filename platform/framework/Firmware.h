// The simulated device's firmware: a change begun with a token, written or
// erased in the background, reported by state and percentage.
#pragma once

#include <condition_variable>
#include <cstdint>
#include <mutex>
#include <string>
#include <thread>

#include "DeviceModel.h"

namespace qel::sim {

/// One device's firmware. Writing and erasing advance one percent per step
/// on a thread of its own, which the destructor stops and joins.
class Firmware {
public:
    explicit Firmware(const FirmwareSettings& settings);
    ~Firmware();
    Firmware(const Firmware&) = delete;
    Firmware& operator=(const Firmware&) = delete;

    /// Issues a new token (any earlier one becomes invalid) and describes the
    /// change in `detailed`, whose line "RequestToken: " carries the token.
    /// kStatusFirmwareBusy while writing or erasing.
    int32_t Begin(uint32_t stopTasks, uint32_t imageLength, std::wstring* detailed);
    /// Starts writing `version`. kStatusBadToken unless `token` is the token of
    /// the change begun; 1 (nothing done, token kept) when `version` is the
    /// installed one and `overwrite` is 0.
    int32_t Write(const wchar_t* token, uint32_t overwrite, const std::wstring& version);
    /// Starts erasing; kStatusBadToken as for Write.
    int32_t Erase(const wchar_t* token);
    void Status(uint32_t* state, uint32_t* percent, uint32_t* requiresRestart, std::wstring* version) const;
    /// A reset: a written firmware becomes the running one.
    /// kStatusFirmwareBusy while writing or erasing.
    int32_t Restart();
    /// The image length announced by Begin (0 when none was).
    uint32_t AnnouncedLength() const;

private:
    int32_t Start(const wchar_t* token, FirmwareState state, const std::wstring& target);
    void Advance();

    const uint32_t millisecondsPerPercent_;
    mutable std::mutex lock_;
    std::condition_variable wake_;
    std::thread worker_;
    bool stopping_ = false;
    FirmwareState state_ = kFirmwareIdle;
    uint32_t percent_ = 0;
    uint32_t announcedLength_ = 0;
    std::wstring running_;   // the version the device runs
    std::wstring pending_;   // written, running after the next reset
    std::wstring target_;    // being written
    std::wstring token_;
    uint64_t tokensIssued_ = 0;
};

}  // namespace qel::sim

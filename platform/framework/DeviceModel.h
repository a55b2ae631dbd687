// The simulated device's description: what the model file in the shared data
// directory says the device holds.
#pragma once

#include <cstdint>
#include <vector>

#include "foundation/Exception.h"
#include "foundation/Guid.h"
#include "foundation/Status.h"
#include "foundation/StringBase.h"

#include "SimControl.h"

namespace qel::sim {

/// A model that could not be loaded; ErrorCode() is the status the framework
/// hands its caller, what() says which part of the model was at fault.
class ModelError : public fnd::exception::Exception {
public:
    ModelError(int32_t line, int32_t status, const fnd::NString& detail)
        : Exception("DeviceModel", line), status_(status), message_(detail) {}
    const char* what() const noexcept override { return message_.CStr(); }
    int32_t ErrorCode() const noexcept override { return status_; }

private:
    int32_t status_;
    fnd::NString message_;
};

/// One installed system expert, its texts already decoded from UTF-8.
struct ExpertRecord {
    fnd::WString programmaticName;
    fnd::WString displayName;
    fnd::WString version;
    fnd::Guid productId;
};

/// The device as the model file describes it. Immutable once loaded; the
/// framework's objects share one instance.
class DeviceModel {
public:
    /// Where the model lives: "sim/device.json" under the shared data directory.
    static fnd::NString DefaultPath();

    /// Reads and parses the file at `path`. Throws ModelError with
    /// kStatusModelMissing when it does not exist, kStatusModelDenied when it
    /// may not be read, and as Parse does for its content.
    static DeviceModel Load(const fnd::NString& path);

    /// Parses a model document. The top level is an object whose "experts"
    /// array holds objects with the strings "programmaticName", "displayName",
    /// "version" and "productId" (a braced GUID); other keys are ignored, so
    /// that a model may describe more than this version reads. Anything else,
    /// including text that is not strict UTF-8, throws ModelError with
    /// kStatusModelInvalid.
    static DeviceModel Parse(const char* bytes, uint32_t count);

    /// The experts in the order the model lists them.
    const std::vector<ExpertRecord>& Experts() const noexcept { return experts_; }

private:
    std::vector<ExpertRecord> experts_;
};

}  // namespace qel::sim

// One installed system expert as the framework hands it out.
#pragma once

#include <memory>

#include "ComObject.h"
#include "DeviceModel.h"

namespace qel::sim {

/// Answers the four queries about one expert of the model. Keeps the model
/// alive, so it may outlive the enumerator and the framework that made it.
class ExpertInfo final : public ComObject<api::IkrSysExpertInfo> {
public:
    ExpertInfo(std::shared_ptr<const DeviceModel> model, const ExpertRecord& record) noexcept
        : model_(std::move(model)), record_(record) {}

    int32_t GetProductID(fnd::Guid* id) override;
    int32_t GetProductDisplayName(api::SysString* name) override;
    int32_t GetProductVersion(api::SysString* version) override;
    int32_t GetProgrammaticName(api::SysString* name) override;

private:
    std::shared_ptr<const DeviceModel> model_;
    const ExpertRecord& record_;  // inside *model_
};

}  // namespace qel::sim

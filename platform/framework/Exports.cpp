// The entry points libqelsysapi.so.5 exports; nothing else leaves the library.
#include <memory>
#include <string>

#include "ComObject.h"
#include "DeviceModel.h"
#include "DeviceState.h"
#include "FrameworkObject.h"
#include "SimControl.h"

#define QEL_SIM_EXPORT __attribute__((visibility("default")))

extern "C" QEL_SIM_EXPORT int32_t qelsysInstantiateFramework(qel::api::IkrSysFramework** out) {
    using namespace qel;
    if (!out) return fnd::kStatusPointer;
    *out = nullptr;
    return sim::Guarded([&] {
        // Read on every instantiation, so that each framework sees the model
        // as it is on disk at that moment.
        fnd::NString path = sim::DeviceModel::DefaultPath();
        auto model = std::make_shared<const sim::DeviceModel>(sim::DeviceModel::Load(path));
        auto state = std::make_shared<sim::DeviceState>(
            model, sim::DeviceState::PathBeside(std::string(path.Data(), path.Length())));
        *out = new sim::FrameworkObject(std::move(model), std::move(state));
        return fnd::kStatusOk;
    });
}

extern "C" QEL_SIM_EXPORT int32_t qelsysSimLiveObjects() { return qel::sim::LiveObjects(); }

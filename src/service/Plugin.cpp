// The plug-in's five exported entry points. No exception crosses into the
// host: each entry point is the last place one can be stopped.
#include "service/ModuleState.h"
#include "service/RequestPipeline.h"
#include "service/WebhostRuntime.h"

extern "C" {

QEL_EXPORT void qelsysapiInit() {
    try {
        qel::service::Initialize();
    } catch (...) {
        // The host cannot be told: start-up ends here with whatever was bound,
        // and requests fall back as they do for a missing entry point.
    }
}

QEL_EXPORT void qelsysapiRun(qel::webhost::RequestMapping* mapping, void* request) {
    qel::service::RunRequest(mapping, request);
}

QEL_EXPORT void qelsysapiFinalize() {
    try {
        qel::service::Finalize();
    } catch (...) {
    }
}

QEL_EXPORT void qelsysapiPause() {}

QEL_EXPORT void qelsysapiResume() {}
}

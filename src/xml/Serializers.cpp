// Result serialization: framework objects into their XML elements.
#include "xml/Serializers.h"

#include "foundation/Status.h"
#include "foundation/ThrowingStatus.h"

namespace qel::xml {

void WriteExpertInfo(XmlElement& parent, api::IkrSysExpertInfo* expert) {
    fnd::ThrowingStatus status;
    if (!expert) status = fnd::kStatusPointer;
    api::Guid productId;
    api::SysStringHolder displayName;
    api::SysStringHolder version;
    api::SysStringHolder programmaticName;
    status = expert->GetProductID(&productId);
    status = expert->GetProductDisplayName(displayName.Out());
    status = expert->GetProductVersion(version.Out());
    status = expert->GetProgrammaticName(programmaticName.Out());

    // Built before the element is opened, so that running out of memory here
    // leaves no half-written element either.
    const fnd::WString idText = productId.ToString();
    const fnd::WString nameText = EscapeXml(displayName.Get(), nullptr);
    const fnd::WString versionText = EscapeXml(version.Get(), nullptr);
    const fnd::WString programmaticText = EscapeXml(programmaticName.Get(), nullptr);

    XmlElement info;
    info.openChild(parent, L"ExpertInfo");
    info.writeAttribute("productID", idText);
    info.writeAttribute("productDisplayName", nameText);
    info.writeAttribute("productVersion", versionText);
    info.writeAttribute("programmaticName", programmaticText);
    info.close();
}

}  // namespace qel::xml

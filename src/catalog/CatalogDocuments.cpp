// Copying definition, constant and binding files into one document.
#include "catalog/CatalogDocuments.h"

#include "catalog/SharedDirectory.h"
#include "foundation/Exception.h"
#include "foundation/osdep/FindFiles.h"
#include "foundation/osdep/IConv.h"
#include "foundation/osdep/TextFile.h"
#include "foundation/osdep/path.h"

namespace qel::catalog {

namespace {

// Client-supplied names become file names in the catalogue directory; a
// name that could step out of it (a slash, "." or "..", or a NUL that would
// cut the name short at the system call) names no item.
bool IsSafeItemName(const WString& name) {
    return name.Find(L'/') == WString::npos && name.Find(L'\0') == WString::npos && !(name == L".") &&
           !(name == L"..");
}

bool IsSafeLanguage(const WString& language) {
    return language.Find(L'/') == WString::npos && language.Find(L'\0') == WString::npos;
}

// Computed on demand when no API request has created the framework yet.
WString CatalogueDirectory() {
    WString directory = SysconfigDirectory();
    return directory.IsEmpty() ? ComputeSysconfigDirectory() : directory;
}

WString ItemFile(const WString& directory, const WString& item, const WString& suffix) {
    return fnd::osdep::JoinPath(directory, item + suffix);
}

}  // namespace

bool InsertDocument(NString& out, const WString& path, bool mustExist, const char* startTag, const WString* name) {
    if (mustExist && !fnd::osdep::IsFile(path)) return false;
    fnd::osdep::TextFile file;
    try {
        file.Open(fnd::osdep::Narrow(path), fnd::osdep::TextFile::kRead);
    } catch (const fnd::exception::Exception&) {
        return false;
    }
    const NString declaration("<?xml");
    const NString tag(startTag ? startTag : "");
    bool stampPending = startTag && name;
    try {
        for (;;) {
            NString line = file.ReadLine();
            if (line.IsEmpty()) return true;
            if (line.Length() >= 5 && fnd::EqualsNoCase(line.Substr(0, 5), declaration)) continue;
            if (stampPending) {
                if (line.Length() >= tag.Length() && fnd::EqualsNoCase(line.Substr(0, tag.Length()), tag)) {
                    NString stamp(" id=\"");
                    stamp.Append(fnd::osdep::Narrow(*name)).PushBack('"');
                    line.Insert(tag.Length(), stamp);
                }
                stampPending = false;
            }
            out.Append(line);
        }
    } catch (const fnd::exception::Exception&) {
        return false;
    }
}

int32_t WriteItemDefinitions(const std::vector<WString>& items, const WString& language, NString& out) {
    const WString directory = CatalogueDirectory();
    const WString tag = IsSafeLanguage(language) ? language : WString();
    const WString prefix = tag.Length() >= 2 ? tag.Substr(0, 2) : WString();
    const bool chinese = fnd::EqualsNoCase(prefix, WString(L"zh"));
    const bool simplified = fnd::EqualsNoCase(tag, WString(L"zh-CN")) || fnd::EqualsNoCase(tag, WString(L"zh-SG"));

    bool copiedAny = false;
    for (const WString& item : items) {
        if (!IsSafeItemName(item)) continue;
        if (!InsertDocument(out, ItemFile(directory, item, WString(L".def.xml")), false, "<item", &item)) continue;
        copiedAny = true;

        std::vector<WString> candidates;
        if (chinese) {
            candidates.push_back(ItemFile(directory, item, WString(L".const.") + tag + L".xml"));
            if (simplified) candidates.push_back(ItemFile(directory, item, WString(L".const.zh-Hans.xml")));
        }
        if (!prefix.IsEmpty()) candidates.push_back(ItemFile(directory, item, WString(L".const.") + prefix + L".xml"));
        candidates.push_back(ItemFile(directory, item, WString(L".const.xml")));
        for (const WString& candidate : candidates)
            if (InsertDocument(out, candidate, true, nullptr, nullptr)) break;
    }
    return copiedAny ? 0 : 1;
}

int32_t WriteAllBindings(NString& out) {
    const WString suffix(L".binding.xml");
    bool copiedAny = false;
    for (const WString& path : fnd::osdep::FindFiles(fnd::osdep::JoinPath(CatalogueDirectory(), WString(L"*") + suffix))) {
        WString file = fnd::osdep::FileName(path);
        WString name = file.Substr(0, file.Length() - suffix.Length());
        if (InsertDocument(out, path, false, "<binding", &name)) copiedAny = true;
    }
    return copiedAny ? 0 : 1;
}

}  // namespace qel::catalog

// Guarded reads of header fields for the geometry library (internal).
#pragma once

#include <cmath>
#include <cstring>
#include <string>

#include "qorv_description_section.h"

namespace NQORV_GEO {

/// The field when the header knows it and it holds a value, else null.
inline const CDescriptionField* setField(const CDescriptionHeader& theHeader, const char* theKey)
{
    const CDescriptionField* f = theHeader.findField(theKey);
    return f != nullptr && f->isInitialised() ? f : nullptr;
}

inline double getDouble(const CDescriptionHeader& theHeader, const char* theKey, double theDefault)
{
    const CDescriptionField* f = setField(theHeader, theKey);
    if (f == nullptr) return theDefault;
    return f->mDataType == CQORV_DT_INTEGER ? static_cast<double>(f->getInteger()) : f->getDouble();
}

inline int getInteger(const CDescriptionHeader& theHeader, const char* theKey, int theDefault)
{
    const CDescriptionField* f = setField(theHeader, theKey);
    if (f == nullptr) return theDefault;
    return f->mDataType == CQORV_DT_DOUBLE ? static_cast<int>(f->getDouble()) : f->getInteger();
}

/// A string field's text, or null when unset.
inline const char* getText(const CDescriptionHeader& theHeader, const char* theKey)
{
    const CDescriptionField* f = setField(theHeader, theKey);
    return f == nullptr ? nullptr : f->getString();
}

/// True when the text field begins with theWord (compared over the word's length).
inline bool beginsWith(const CDescriptionHeader& theHeader, const char* theKey, const char* theWord)
{
    const char* s = getText(theHeader, theKey);
    return s != nullptr && std::strncmp(s, theWord, std::strlen(theWord)) == 0;
}

/// The header file of a name: kept when it ends in one of the given endings, else "_hdr" appended.
inline std::string headerFileName(const char* theName, bool theAcceptPlainHdr)
{
    auto endsWith = [](const std::string& s, const char* e) {
        const std::size_t n = std::strlen(e);
        return s.size() >= n && s.compare(s.size() - n, n, e) == 0;
    };
    const std::string aName = theName;
    if (endsWith(aName, "_orb_hdr") || endsWith(aName, "_orb.sml") || (theAcceptPlainHdr && endsWith(aName, "_hdr")))
        return aName;
    return aName + "_hdr";
}

/// Reads a header by the name rule above; the raster name itself (whose ".sml" the store finds)
/// is tried second. Returns the name that was read, empty when neither could be read.
inline std::string readHeaderByName(CDescriptionHeader& theHeader, const char* theName, bool theAcceptPlainHdr)
{
    const std::string aFirst = headerFileName(theName, theAcceptPlainHdr);
    if (theHeader.read(aFirst.c_str(), false)) return aFirst;
    if (aFirst != theName && theHeader.read(theName, false)) return theName;
    return std::string();
}

}  // namespace NQORV_GEO

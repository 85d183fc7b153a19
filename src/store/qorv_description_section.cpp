// Fields, sections and headers of the parameter store; key files, mandatory files, user keys.
#include "qorv_description_section.h"

#include <cstdio>
#include <cstdlib>
#include <algorithm>
#include <cstring>
#include <map>

#include "qorv_enviroment.h"
#include "qorv_errors.h"
#include "qorv_generic_utility.h"
#include "qorv_description_xml.h"
#include "qorv_store_io.h"

const char* const CQORV_ALL_SECTIONS[CQORV_ALL_SECTIONS_NBR] = {
    "EnvisatDescriptionRecord", "EnvisatFixHeader", "user_defined_section", "CartographicSystem",
    "RegistrationCoordinates", "DEMCoordinates", "AcquisitionParameters", "ChannelInfo", "Sensor",
    "orbit_information", "sar_processing", "interferometric_processing",
    "PolarimetricCalibrationParameters", "RasterInfo", "Processing", "InitialGeometry",
    "StateVectorData", "StateVectorCalc", "OrbitCorrection", "Baseline", "GCPRasterInfo"};

const char* fqorvStructureName(int theStructure)
{
    switch (theStructure) {
    case CQORV_DS_SCALAR: return "SCALAR";
    case CQORV_DS_VECTOR: return "VECTOR";
    case CQORV_DS_MATRIX: return "MARTIX";  // the printed name keeps this spelling
    case CQORV_DS_MULTIPLE: return "MULTIPLE";
    default: return "WRONG";
    }
}

const char* fqorvDataTypeName(int theDataType)
{
    switch (theDataType) {
    case CQORV_DT_INTEGER: return "Integer";
    case CQORV_DT_DOUBLE: return "Double";
    case CQORV_DT_STRING: return "String";
    case CQORV_DT_FIELD: return "Field Of Section pointer";
    default: return "WRONG";
    }
}

// ------------------------------------------------------------------------------------------------
// CDescriptionField

CDescriptionField::CDescriptionField(const char* theName, int theStructure, int theDataType, int theParentIndex)
    : mParentIndex(theParentIndex), mName(theName ? theName : ""), mStructure(theStructure),
      mDataType(theDataType), mRowNbr(0), mColNbr(0)
{
    if (mStructure == CQORV_DS_SCALAR) {
        resize(1, 1);
    } else if (mStructure == CQORV_DS_MULTIPLE) {
        mDataType = CQORV_DT_FIELD;
        mRowNbr = 1;
    }
}

void CDescriptionField::fail(int theId) const
{
    print(true);
    QORV_FATAL(theId, name());
}

bool CDescriptionField::isInitialised() const
{
    if (mRowNbr < 1 || mColNbr < 1) return false;
    switch (mStructure) {
    case CQORV_DS_SCALAR: return !mSet.empty() && mSet[0] != 0;
    case CQORV_DS_VECTOR:
    case CQORV_DS_MATRIX: return true;
    case CQORV_DS_MULTIPLE:
        for (const CDescriptionField* aSub : mSubFields)
            if (!aSub || !aSub->isInitialised()) return false;
        return true;
    default: return false;
    }
}

void CDescriptionField::resize(int theRows, int theCols)
{
    if (mStructure == CQORV_DS_MULTIPLE) {
        for (CDescriptionField* aSub : mSubFields) {
            if (!aSub || aSub->mStructure != CQORV_DS_VECTOR) fail(CQORV_ERR_FIELD_TYPE);
            aSub->resize(theRows, theCols);
        }
        return;
    }
    if (theRows < 0 || theCols < 0) {
        fdfTrace("mRowNbr = %d theRow = %d mColNbr = %d theCol = %d\n", mRowNbr, theRows, mColNbr, theCols);
        fail(CQORV_ERR_INDEX_RANGE);
    }
    if (mStructure == CQORV_DS_SCALAR && (theRows != 1 || theCols != 1)) fail(CQORV_ERR_FIELD_TYPE);
    const std::size_t aCount = static_cast<std::size_t>(theRows) * static_cast<std::size_t>(theCols);
    mIntData.clear();
    mDoubleData.clear();
    mStringData.clear();
    mSet.clear();
    switch (mDataType) {
    case CQORV_DT_INTEGER: mIntData.assign(aCount, 0); break;
    case CQORV_DT_DOUBLE: mDoubleData.assign(aCount, 0.0); break;
    case CQORV_DT_STRING: mStringData.assign(aCount, std::string()); break;
    default: break;
    }
    mSet.assign(aCount, 0);
    mRowNbr = theRows;
    mColNbr = theCols;
    mIntData.shrink_to_fit();
    mDoubleData.shrink_to_fit();
    mStringData.shrink_to_fit();
    mSet.shrink_to_fit();
}

void CDescriptionField::reset()
{
    switch (mStructure) {
    case CQORV_DS_SCALAR: resize(1, 1); break;
    case CQORV_DS_VECTOR:
    case CQORV_DS_MATRIX: resize(0, 0); break;
    case CQORV_DS_MULTIPLE:
        for (CDescriptionField* aSub : mSubFields)
            if (aSub) aSub->reset();
        break;
    default: break;
    }
}

std::size_t CDescriptionField::readIndex(int theRow, int theCol, int theType, bool theNForm) const
{
    if (mDataType != theType) fail(CQORV_ERR_FIELD_TYPE);
    if (theNForm && theCol > 0 && (mStructure == CQORV_DS_MATRIX || mStructure == CQORV_DS_SCALAR))
        fail(CQORV_ERR_FIELD_TYPE);
    if (theRow < 0 || theRow >= mRowNbr || theCol < 0 || theCol >= mColNbr) {
        fdfTrace("%d READ error \n", theNForm ? theCol : theRow * (mColNbr > 0 ? mColNbr : 1) + theCol);
        // The sizes of a pulse duration vector may lag the channel count: its reads past the end
        // answer the table's "no value" (the caller tests for it).
        if (theNForm && theType == CQORV_DT_DOUBLE && mName.find("PulseDuration") != std::string::npos)
            return static_cast<std::size_t>(-1);
        fail(CQORV_ERR_INDEX_RANGE);
    }
    const std::size_t aIndex = static_cast<std::size_t>(theRow) * static_cast<std::size_t>(mColNbr) +
                               static_cast<std::size_t>(theCol);
    if ((mStructure == CQORV_DS_SCALAR || theType == CQORV_DT_STRING) && !mSet[aIndex])
        fail(CQORV_ERR_FIELD_NOT_SET);
    return aIndex;
}

std::size_t CDescriptionField::writeIndex(int theRow, int theCol, int theType)
{
    if (mSet.empty()) fail(CQORV_ERR_INDEX_RANGE);
    if (theRow < 0 || theRow >= mRowNbr || theCol < 0 || theCol >= mColNbr) {
        fdfTrace("mRowNbr = %d theRow = %d mColNbr = %d theCol = %d\n", mRowNbr, theRow, mColNbr, theCol);
        fail(CQORV_ERR_INDEX_RANGE);
    }
    if (mDataType != theType) fail(CQORV_ERR_FIELD_TYPE);
    const std::size_t aIndex = static_cast<std::size_t>(theRow) * static_cast<std::size_t>(mColNbr) +
                               static_cast<std::size_t>(theCol);
    mSet[aIndex] = 1;
    return aIndex;
}

int CDescriptionField::getInteger() const { return getInteger(0); }
double CDescriptionField::getDouble() const { return getDouble(0); }
const char* CDescriptionField::getString() const { return getString(0); }

int CDescriptionField::getInteger(int n) const { return mIntData[readIndex(0, n, CQORV_DT_INTEGER, true)]; }

double CDescriptionField::getDouble(int n) const
{
    const std::size_t aIndex = readIndex(0, n, CQORV_DT_DOUBLE, true);
    return aIndex == static_cast<std::size_t>(-1) ? CQORV_NO_VALUE : mDoubleData[aIndex];
}

const char* CDescriptionField::getString(int n) const
{
    return mStringData[readIndex(0, n, CQORV_DT_STRING, true)].c_str();
}

int CDescriptionField::getInteger(int theRow, int theCol) const
{
    return mIntData[readIndex(theRow, theCol, CQORV_DT_INTEGER, false)];
}

double CDescriptionField::getDouble(int theRow, int theCol) const
{
    return mDoubleData[readIndex(theRow, theCol, CQORV_DT_DOUBLE, false)];
}

const char* CDescriptionField::getString(int theRow, int theCol) const
{
    return mStringData[readIndex(theRow, theCol, CQORV_DT_STRING, false)].c_str();
}

void CDescriptionField::setValue(int theValue) { setValue(0, 0, theValue); }
void CDescriptionField::setValue(double theValue) { setValue(0, 0, theValue); }
void CDescriptionField::setValue(const char* theValue) { setValue(0, 0, theValue); }
void CDescriptionField::setValue(int n, int theValue) { setValue(0, n, theValue); }
void CDescriptionField::setValue(int n, double theValue) { setValue(0, n, theValue); }
void CDescriptionField::setValue(int n, const char* theValue) { setValue(0, n, theValue); }

void CDescriptionField::setValue(int theRow, int theCol, int theValue)
{
    mIntData[writeIndex(theRow, theCol, CQORV_DT_INTEGER)] = theValue;
}

void CDescriptionField::setValue(int theRow, int theCol, double theValue)
{
    mDoubleData[writeIndex(theRow, theCol, CQORV_DT_DOUBLE)] = theValue;
}

void CDescriptionField::setValue(int theRow, int theCol, const char* theValue)
{
    mStringData[writeIndex(theRow, theCol, CQORV_DT_STRING)] = theValue ? theValue : "";
}

bool CDescriptionField::isSet(int theRow, int theCol) const
{
    if (theRow < 0 || theRow >= mRowNbr || theCol < 0 || theCol >= mColNbr) return false;
    const std::size_t aIndex = static_cast<std::size_t>(theRow) * static_cast<std::size_t>(mColNbr) +
                               static_cast<std::size_t>(theCol);
    return aIndex < mSet.size() && mSet[aIndex] != 0;
}

int CDescriptionField::getNbrOfElements() const
{
    if (mStructure == CQORV_DS_MULTIPLE)
        return mSubFields.empty() || !mSubFields[0] ? 0 : mSubFields[0]->getNbrOfElements();
    return mColNbr;
}

CDescriptionField* CDescriptionField::getSubField(int i) const
{
    if (mStructure != CQORV_DS_MULTIPLE) fail(CQORV_ERR_FIELD_TYPE);
    if (i < 0 || static_cast<std::size_t>(i) >= mSubFields.size()) fail(CQORV_ERR_INDEX_RANGE);
    return mSubFields[static_cast<std::size_t>(i)];
}

void CDescriptionField::setSubField(int i, CDescriptionField* theField)
{
    if (mStructure != CQORV_DS_MULTIPLE) fail(CQORV_ERR_FIELD_TYPE);
    if (i < 0) fail(CQORV_ERR_INDEX_RANGE);
    if (static_cast<std::size_t>(i) >= mSubFields.size()) mSubFields.resize(static_cast<std::size_t>(i) + 1, nullptr);
    mSubFields[static_cast<std::size_t>(i)] = theField;
    mColNbr = static_cast<int>(mSubFields.size());
}

void CDescriptionField::copyFrom(const CDescriptionField& theOther)
{
    if (&theOther == this || !theOther.isInitialised()) return;
    if (theOther.mStructure != mStructure || theOther.mDataType != mDataType) fail(CQORV_ERR_FIELD_TYPE);
    if (mStructure == CQORV_DS_MULTIPLE) {
        const std::size_t aCount = std::min(mSubFields.size(), theOther.mSubFields.size());
        for (std::size_t i = 0; i < aCount; ++i)
            if (mSubFields[i] && theOther.mSubFields[i]) mSubFields[i]->copyFrom(*theOther.mSubFields[i]);
        return;
    }
    if (mStructure != CQORV_DS_SCALAR) resize(theOther.mRowNbr, theOther.mColNbr);
    const std::size_t aCount = theOther.mSet.size();
    for (std::size_t i = 0; i < aCount && i < mSet.size(); ++i) {
        if (!theOther.mSet[i]) continue;
        switch (mDataType) {
        case CQORV_DT_INTEGER: mIntData[i] = theOther.mIntData[i]; break;
        case CQORV_DT_DOUBLE: mDoubleData[i] = theOther.mDoubleData[i]; break;
        case CQORV_DT_STRING: mStringData[i] = theOther.mStringData[i]; break;
        default: break;
        }
        mSet[i] = 1;
    }
}

void CDescriptionField::print(bool theWithEmpty) const
{
    const bool aEmpty = isEmpty();
    if (aEmpty && !theWithEmpty) return;
    std::string aLine = fqorvStringFormat("[%s]  [%s]  [%s]", name(), fqorvStructureName(mStructure),
                                          fqorvDataTypeName(mDataType));
    if (aEmpty) {
        fdfTrace("%s: EMPTY\n", aLine.c_str());
        return;
    }
    switch (mStructure) {
    case CQORV_DS_VECTOR: aLine += fqorvStringFormat("  [Number of elements : %d]", mColNbr); break;
    case CQORV_DS_MATRIX: aLine += fqorvStringFormat("  [Row Nbr : %d]  [Col Nbr : %d]", mRowNbr, mColNbr); break;
    case CQORV_DS_MULTIPLE:
        aLine += fqorvStringFormat("  [Number of sub fiels : %d]", static_cast<int>(mSubFields.size()));
        break;
    default: break;
    }
    if (mStructure != CQORV_DS_MULTIPLE && !mSet.empty()) {
        switch (mDataType) {
        case CQORV_DT_INTEGER: aLine += fqorvStringFormat("  =  %ld", static_cast<long>(mIntData[0])); break;
        case CQORV_DT_DOUBLE: aLine += "  =  " + fqorvFormatDouble(mDoubleData[0]); break;
        case CQORV_DT_STRING: aLine += fqorvStringFormat("  =  [%s]", mStringData[0].c_str()); break;
        default: break;
        }
    }
    fdfTrace("%s\n", aLine.c_str());
}

// ------------------------------------------------------------------------------------------------
// CDescriptionSection

CDescriptionSection::CDescriptionSection(const char* theName) : mName(theName ? theName : "")
{
    const std::string aPath = fdfGetSetting(CQORV_KEY_FILES_DIR) + mName + ".key";
    loadKeys(aPath.c_str(), mName.c_str());
}

CDescriptionSection::CDescriptionSection(const char* theName, const char* theKeyFile) : mName(theName ? theName : "")
{
    loadKeys(theKeyFile, mName.c_str());
}

namespace {

/// A type token of a key file: structure and data type, with the sub-field count of a MULTIPLE.
struct CKeyType {
    int mStructure = -1;
    int mDataType = -1;
    int mCount = 0;  // above 0: a MULTIPLE of that many sub-fields
};

bool fParseKeyType(const char* theToken, CKeyType& theType)
{
    if (!theToken || !*theToken) return false;
    const char* p = theToken;
    bool aHasCount = false;
    long aCount = 0;
    while (*p >= '0' && *p <= '9') {
        aHasCount = true;
        aCount = aCount * 10 + (*p - '0');
        if (aCount > CQORV_DS_MAX_NBR_FIELDS) return false;
        ++p;
    }
    if (aHasCount && aCount < 1) return false;
    int aStructure = CQORV_DS_SCALAR;
    if (*p == 'V') {
        aStructure = CQORV_DS_VECTOR;
        ++p;
    } else if (*p == 'M') {
        aStructure = CQORV_DS_MATRIX;
        ++p;
    }
    int aType = -1;
    if (*p == 'I') aType = CQORV_DT_INTEGER;
    else if (*p == 'D' || *p == 'F') aType = CQORV_DT_DOUBLE;
    else if (*p == 'S') aType = CQORV_DT_STRING;
    if (aType < 0 || p[1] != '\0') return false;
    if (aHasCount && aStructure == CQORV_DS_MATRIX) return false;  // sub-fields are SCALAR or VECTOR
    theType.mStructure = aStructure;
    theType.mDataType = aType;
    theType.mCount = static_cast<int>(aCount);
    return true;
}

/// Cuts a line of a key or mandatory file at the first ';', line feed or carriage return.
void fCutComment(char* theLine) { theLine[std::strcspn(theLine, ";\n\r")] = '\0'; }

/// A section header: '[' as first or second character. The name is the first token from '[' on.
bool fSectionHeaderName(const char* theLine, std::string& theName)
{
    const char* aOpen = nullptr;
    if (theLine[0] == '[') aOpen = theLine;
    else if (theLine[0] != '\0' && theLine[1] == '[') aOpen = theLine + 1;
    if (!aOpen) return false;
    const char* p = aOpen;
    while (*p && std::strchr("\t [", *p)) ++p;
    const char* aEnd = p;
    while (*aEnd && !std::strchr("\t []", *aEnd)) ++aEnd;
    theName.assign(p, aEnd);
    return true;
}

}  // namespace

bool CDescriptionSection::loadKeys(const char* theKeyFile, const char* theSectionName)
{
    CPoolBufferLease aLease;
    mFields.clear();
    mFieldNbr = 0;
    const std::string aPath = theKeyFile ? theKeyFile : "";
    FILE* aFile = aPath.empty() ? nullptr : std::fopen(aPath.c_str(), "rb");
    if (!aFile) {
        fdfTrace("Error: missing key file %s\n", aPath.c_str());
        QORV_FATAL(CQORV_ERR_MISSING_FILE, aPath.c_str());
    }
    CStdioFile aCloser(aFile);
    const bool aAnyName = !theSectionName || !*theSectionName;
    char* aLine = aLease.data();
    const int aLineSize = static_cast<int>(aLease.size());
    bool aFound = false;
    int aLineNbr = 0;
    std::string aName;
    while (std::fgets(aLine, aLineSize, aFile)) {
        fCutComment(aLine);
        if (!*aLine) continue;
        if (!aFound) {
            if (fSectionHeaderName(aLine, aName) && (aAnyName || aName == theSectionName)) {
                aFound = true;
                if (aAnyName) mName = aName;
            }
            continue;
        }
        if (!std::strchr(aLine, '=')) continue;
        if (++aLineNbr >= CQORV_DS_MAX_NBR_FIELDS) {
            fdfTrace("CQORV_DS_MAX_NBR_FIELDS = %d aFieldsNbr = %d\n", CQORV_DS_MAX_NBR_FIELDS, aLineNbr);
            print(true);
            QORV_FATAL(CQORV_ERR_KEY_FILE, aPath.c_str());
        }
        const std::string aCopy = aLine;
        char* aSave = nullptr;
        const char* aFieldName = strtok_r(aLine, "\t =", &aSave);
        const char* aTypeToken = aFieldName ? strtok_r(nullptr, "\t =(", &aSave) : nullptr;
        CKeyType aType;
        if (!aFieldName) continue;
        if (!fParseKeyType(aTypeToken, aType)) {
            print(true);
            QORV_FATAL(CQORV_ERR_FIELD_TYPE, aCopy.c_str());
        }
        if (aType.mCount == 0) {
            mFields.push_back(std::make_unique<CDescriptionField>(aFieldName, aType.mStructure, aType.mDataType));
        } else {
            const int aParent = static_cast<int>(mFields.size());
            auto aMultiple = std::make_unique<CDescriptionField>(aFieldName, CQORV_DS_MULTIPLE, CQORV_DT_FIELD);
            CDescriptionField* aMulti = aMultiple.get();
            mFields.push_back(std::move(aMultiple));
            for (int i = 0; i < aType.mCount; ++i) {
                const char* aSubName = strtok_r(nullptr, "\t =(),", &aSave);
                if (!aSubName) {
                    print(true);
                    QORV_FATAL(CQORV_ERR_KEY_FILE, aCopy.c_str());
                }
                auto aSub = std::make_unique<CDescriptionField>(aSubName, aType.mStructure, aType.mDataType, aParent);
                aMulti->setSubField(i, aSub.get());
                mFields.push_back(std::move(aSub));
            }
        }
        if (mFields.size() > static_cast<std::size_t>(CQORV_DS_MAX_NBR_FIELDS)) {
            fdfTrace("CQORV_DS_MAX_NBR_FIELDS = %d aFieldsNbr = %d\n", CQORV_DS_MAX_NBR_FIELDS,
                     static_cast<int>(mFields.size()));
            print(true);
            QORV_FATAL(CQORV_ERR_KEY_FILE, aPath.c_str());
        }
    }
    mFieldNbr = static_cast<int>(mFields.size());
    return aFound;
}

CDescriptionField* CDescriptionSection::findField(const char* theName) const
{
    if (!theName) return nullptr;
    for (const auto& aField : mFields)
        if (aField->mName == theName) return aField.get();
    return nullptr;
}

bool CDescriptionSection::copyFrom(const CDescriptionSection& theOther)
{
    if (theOther.mName != mName) return false;
    for (const auto& aSource : theOther.mFields) {
        // A MULTIPLE is copied through its sub-fields, which stand in the list by their own names.
        if (aSource->mStructure == CQORV_DS_MULTIPLE) continue;
        if (aSource->mName == "RealScaleFactor" || aSource->mName == "ImaginaryScaleFactor") continue;
        CDescriptionField* aTarget = findField(aSource->mName.c_str());
        if (aTarget) aTarget->copyFrom(*aSource);
    }
    return true;
}

void CDescriptionSection::reset()
{
    for (auto& aField : mFields) aField->reset();
}

bool CDescriptionSection::hasInitialisedField() const
{
    for (const auto& aField : mFields)
        if (aField->mParentIndex == -1 && aField->isInitialised()) return true;
    return false;
}

void CDescriptionSection::print(bool theWithEmpty) const
{
    fdfTrace("\n\n << [%s]  -  Total number of Fields : %d >>\n\n", name(), static_cast<int>(mFields.size()));
    for (const auto& aField : mFields) aField->print(theWithEmpty);
}

// ------------------------------------------------------------------------------------------------
// CDescriptionHeader

CDescriptionHeader::CDescriptionHeader() = default;

CDescriptionHeader::CDescriptionHeader(std::initializer_list<const char*> theSections)
{
    std::vector<std::string> aNames;
    for (const char* aName : theSections) {
        if (!aName) break;
        aNames.emplace_back(aName);
    }
    init(aNames);
}

CDescriptionHeader::CDescriptionHeader(const std::vector<std::string>& theSections) { init(theSections); }

CDescriptionHeader::CDescriptionHeader(const char* theRootTag, std::initializer_list<const char*> theSections)
    : CDescriptionHeader(theSections)
{
    mRootTag = theRootTag ? theRootTag : "";
    for (auto& aSection : mSections) aSection->mRootTag = mRootTag;
}

std::unique_ptr<CDescriptionHeader> CDescriptionHeader::makeFull()
{
    return std::make_unique<CDescriptionHeader>(
        std::vector<std::string>(CQORV_ALL_SECTIONS, CQORV_ALL_SECTIONS + CQORV_ALL_SECTIONS_NBR));
}

void CDescriptionHeader::init(const std::vector<std::string>& theSections)
{
    mSections.clear();
    mSections.reserve(theSections.size());
    for (const std::string& aName : theSections) {
        mSections.push_back(std::make_unique<CDescriptionSection>(aName.c_str()));
        mSections.back()->mRootTag = mRootTag;
    }
    mSectionNbr = static_cast<int>(mSections.size());
}

CDescriptionField* CDescriptionHeader::findField(const char* theKey) const
{
    if (!theKey) return nullptr;
    if (const char* aDot = std::strchr(theKey, '.')) {
        const std::size_t aLen = static_cast<std::size_t>(aDot - theKey);
        if (aLen > CQORV_DS_MAX_SECTION_NAME) return nullptr;
        for (const auto& aSection : mSections)
            if (aSection->mName.size() == aLen && aSection->mName.compare(0, aLen, theKey, aLen) == 0)
                return aSection->findField(aDot + 1);
        return nullptr;
    }
    for (const auto& aSection : mSections)
        if (CDescriptionField* aField = aSection->findField(theKey)) return aField;
    return nullptr;
}

CDescriptionField& CDescriptionHeader::getField(const char* theKey) const
{
    if (CDescriptionField* aField = findField(theKey)) return *aField;
    print(true);
    print(true);
    QORV_FATAL(CQORV_ERR_UNKNOWN_KEY, theKey ? theKey : "");
}

CDescriptionSection* CDescriptionHeader::getSection(const char* theName) const
{
    if (!theName) return nullptr;
    for (const auto& aSection : mSections)
        if (aSection->mName == theName) return aSection.get();
    return nullptr;
}

CDescriptionSection* CDescriptionHeader::getSection(int theIndex) const
{
    if (theIndex < 0 || static_cast<std::size_t>(theIndex) >= mSections.size()) return nullptr;
    return mSections[static_cast<std::size_t>(theIndex)].get();
}

void CDescriptionHeader::reset()
{
    for (auto& aSection : mSections) aSection->reset();
}

void CDescriptionHeader::copyFrom(const CDescriptionHeader& theOther, bool theResetFirst)
{
    if (&theOther == this) return;
    if (theResetFirst) reset();
    for (const auto& aSource : theOther.mSections) {
        CDescriptionSection* aTarget = getSection(aSource->mName.c_str());
        if (aTarget && !aTarget->copyFrom(*aSource)) QORV_FATAL(CQORV_ERR_KEY_FILE, "");
    }
}

void CDescriptionHeader::print(bool theWithEmpty) const
{
    fdfTrace("\n\n << Total number of Sections : %d >>", static_cast<int>(mSections.size()));
    for (const auto& aSection : mSections) aSection->print(theWithEmpty);
}

bool CDescriptionHeader::checkMandatory(const char* theName, bool theFailHard)
{
    std::string aPath = theName ? theName : "";
    if (!fqorvFileExists(aPath)) aPath = fdfGetSetting(CQORV_MANDATORY_DIR) + aPath + ".mandatory";
    FILE* aFile = std::fopen(aPath.c_str(), "rb");
    if (!aFile) {
        fdfTrace("Error: missing mandatory file %s\n", aPath.c_str());
        if (theFailHard) QORV_FATAL(CQORV_ERR_MISSING_FILE, aPath.c_str());
        return false;
    }
    // The names listed per section, in the file's order.
    std::map<std::string, std::vector<std::string>> aListed;
    {
        CStdioFile aCloser(aFile);
        CPoolBufferLease aLease;
        char* aLine = aLease.data();
        std::vector<std::string>* aCurrent = nullptr;
        std::string aName;
        while (std::fgets(aLine, static_cast<int>(aLease.size()), aFile)) {
            fCutComment(aLine);
            if (!*aLine) continue;
            if (fSectionHeaderName(aLine, aName)) {
                aCurrent = &aListed[aName];
                continue;
            }
            char* aSave = nullptr;
            const char* aField = strtok_r(aLine, "\t =", &aSave);
            if (aCurrent && aField) aCurrent->emplace_back(aField);
        }
    }
    for (const auto& aSection : mSections) {
        const auto aIt = aListed.find(aSection->mName);
        if (aIt == aListed.end()) continue;
        bool aMissing = false;
        for (const std::string& aFieldName : aIt->second) {
            const CDescriptionField* aField = aSection->findField(aFieldName.c_str());
            if (aField && !aField->isInitialised()) {
                fdfLog("Mandatory Field [%s] is not found in [%s] section\n", aFieldName.c_str(), aSection->name());
                aMissing = true;
            }
        }
        if (aMissing) {
            aSection->print(true);
            if (theFailHard) QORV_FATAL(CQORV_ERR_MANDATORY, aPath.c_str());
            return false;
        }
    }
    return true;
}

// ------------------------------------------------------------------------------------------------
// User keys of "RasterInfo.OtherInfo"

bool fqorvGetUserKey(const CDescriptionHeader& theHeader, const char* theKey, std::string& theValue)
{
    const CDescriptionField* aInfo = theHeader.findField("RasterInfo.OtherInfo");
    if (!theKey || !aInfo || !aInfo->isInitialised() || aInfo->mDataType != CQORV_DT_STRING) return false;
    const std::size_t aKeyLen = std::strlen(theKey);
    for (int r = 0; r < aInfo->mRowNbr; ++r) {
        if (!aInfo->isSet(r, 0)) continue;
        const std::string& aRowKey = aInfo->mStringData[static_cast<std::size_t>(r) * aInfo->mColNbr];
        if (aRowKey.compare(0, aKeyLen, theKey, aKeyLen) != 0) continue;
        theValue = aInfo->mColNbr > 1 && aInfo->isSet(r, 1)
                       ? aInfo->mStringData[static_cast<std::size_t>(r) * aInfo->mColNbr + 1]
                       : std::string();
        return true;
    }
    return false;
}

void fqorvSetUserKey(CDescriptionHeader& theHeader, const char* theKey, const char* theValue)
{
    CDescriptionField& aInfo = theHeader.getField("RasterInfo.OtherInfo");
    const char* aKey = theKey ? theKey : "";
    if (aInfo.isInitialised() && aInfo.mColNbr >= 2) {
        for (int r = 0; r < aInfo.mRowNbr; ++r) {
            if (aInfo.isSet(r, 0) && aInfo.mStringData[static_cast<std::size_t>(r) * aInfo.mColNbr] == aKey) {
                aInfo.setValue(r, 1, theValue);
                return;
            }
        }
    }
    // resize() clears the storage: keep the old rows and put them back.
    const int aOldRows = aInfo.isInitialised() ? aInfo.mRowNbr : 0;
    const int aOldCols = aInfo.isInitialised() ? aInfo.mColNbr : 0;
    std::vector<std::string> aOldData = aInfo.mStringData;
    std::vector<uint8_t> aOldSet = aInfo.mSet;
    aInfo.resize(aOldRows + 1, 2);
    for (int r = 0; r < aOldRows; ++r) {
        for (int c = 0; c < 2 && c < aOldCols; ++c) {
            const std::size_t aOld = static_cast<std::size_t>(r) * aOldCols + c;
            if (aOld < aOldSet.size() && aOldSet[aOld]) aInfo.setValue(r, c, aOldData[aOld].c_str());
        }
    }
    aInfo.setValue(aOldRows, 0, aKey);
    aInfo.setValue(aOldRows, 1, theValue);
}

bool fqorvHasValue(const CDescriptionHeader& theHeader, const char* theKey)
{
    const CDescriptionField* aField = theHeader.findField(theKey);
    return aField != nullptr && aField->isInitialised();
}

std::unique_ptr<CDescriptionHeader> fqorvReadStepHeader(const std::string& theName, const char* theWords, bool theParameters)
{
    std::unique_ptr<CDescriptionHeader> aHeader =
        theParameters ? std::make_unique<CDescriptionHeader>(std::initializer_list<const char*>{"sar_processing"})
                      : CDescriptionHeader::makeFull();
    if (!aHeader->read(theName.c_str(), false)) {
        fdfTrace("%s%s\n", theWords, theName.c_str());
        QORV_FATAL(CQORV_ERR_MISSING_FILE, theName.c_str());
    }
    return aHeader;
}

// The parameter store: named fields in named sections, grouped in a header.
//
// A section's field list is not compiled in: it comes from the key file
// <QORVEX_KEY_FILES_DIR><section name>.key at run time. Every step builds a CDescriptionHeader,
// reads header files into it, reads and changes fields by name ("Section.Field" or "Field") and
// writes it back. Failures go through QORV_FATAL with the ids of the error catalogue.
#pragma once

#include <cstddef>
#include <cstdint>
#include <initializer_list>
#include <memory>
#include <string>
#include <vector>

#include "qorv_line_pool.h"

// Structures and data types of a field.
inline constexpr int CQORV_DS_SCALAR = 0;
inline constexpr int CQORV_DS_VECTOR = 1;
inline constexpr int CQORV_DS_MATRIX = 2;
inline constexpr int CQORV_DS_MULTIPLE = 3;

inline constexpr int CQORV_DT_INTEGER = 0;
inline constexpr int CQORV_DT_DOUBLE = 1;
inline constexpr int CQORV_DT_STRING = 2;
inline constexpr int CQORV_DT_FIELD = 3;  // "Field Of Section pointer": the type of a MULTIPLE

inline constexpr int CQORV_DS_MAX_NBR_FIELDS = 5050;
/// Longest section name in a "Section.Field" key.
inline constexpr std::size_t CQORV_DS_MAX_SECTION_NAME = 1024;

/// The 21 sections of a full header, in the order that steps pass them.
inline constexpr int CQORV_ALL_SECTIONS_NBR = 21;
extern const char* const CQORV_ALL_SECTIONS[CQORV_ALL_SECTIONS_NBR];

/// Printed names: "SCALAR", "VECTOR", "MARTIX", "MULTIPLE"; "Integer", "Double", "String",
/// "Field Of Section pointer"; anything else "WRONG".
const char* fqorvStructureName(int theStructure);
const char* fqorvDataTypeName(int theDataType);

/// One field: a scalar, vector, matrix of integers, doubles or strings, or a MULTIPLE that groups
/// sub-fields (all SCALAR or all VECTOR) owned by the section.
///
/// Element access with n, row, col zero-based. The forms without an index mean element 0; the forms
/// with n mean element n of row 0. Reads check, in this order: the data type (848644), the
/// structure (n above 0 on a SCALAR or MATRIX: 848644), the position (848646; getDouble(n) on a
/// field whose name holds "PulseDuration" answers -9999.0 instead), the flag of a SCALAR or of a
/// string element (848645). Writes check: storage (848646), position (848646), data type (848644).
/// No conversion takes place between types.
class CDescriptionField {
public:
    CDescriptionField(const char* theName, int theStructure, int theDataType, int theParentIndex = -1);
    CDescriptionField(const CDescriptionField&) = delete;
    CDescriptionField& operator=(const CDescriptionField&) = delete;

    /// SCALAR: its element is set; VECTOR, MATRIX: it has a size; MULTIPLE: all sub-fields are.
    bool isInitialised() const;
    bool isEmpty() const { return !isInitialised(); }

    /// Frees the old storage, allocates zeroed values and cleared flags. A MULTIPLE resizes each
    /// sub-field, which must be VECTORs (else 848644).
    void resize(int theRows, int theCols);
    /// Frees a VECTOR's or MATRIX's values and sets its size to 0; clears a SCALAR's flag.
    void reset();

    int getInteger() const;
    double getDouble() const;
    const char* getString() const;
    int getInteger(int n) const;
    double getDouble(int n) const;
    const char* getString(int n) const;
    int getInteger(int theRow, int theCol) const;
    double getDouble(int theRow, int theCol) const;
    const char* getString(int theRow, int theCol) const;

    void setValue(int theValue);
    void setValue(double theValue);
    void setValue(const char* theValue);
    void setValue(const std::string& theValue) { setValue(theValue.c_str()); }
    void setValue(int n, int theValue);
    void setValue(int n, double theValue);
    void setValue(int n, const char* theValue);
    void setValue(int n, const std::string& theValue) { setValue(n, theValue.c_str()); }
    void setValue(int theRow, int theCol, int theValue);
    void setValue(int theRow, int theCol, double theValue);
    void setValue(int theRow, int theCol, const char* theValue);
    void setValue(int theRow, int theCol, const std::string& theValue) { setValue(theRow, theCol, theValue.c_str()); }

    /// Whether element (row, col) holds a value (no range failure: false outside).
    bool isSet(int theRow, int theCol) const;

    int getNbrOfRows() const { return mRowNbr; }
    /// mColNbr; for a MULTIPLE the element count of its first sub-field (0 without one).
    int getNbrOfElements() const;

    CDescriptionField* getSubField(int i) const;
    void setSubField(int i, CDescriptionField* theField);

    /// Copies size and values; only elements whose flag is set. Copying a field that is not
    /// initialised does nothing; fields of another structure or type are failure 848644.
    void copyFrom(const CDescriptionField& theOther);

    /// Writes "[%s]  [%s]  [%s]" with name, structure and type, then ": EMPTY" or the count and
    /// the first value, to the trace. theWithEmpty false leaves an empty field out.
    void print(bool theWithEmpty = true) const;

    const char* name() const { return mName.empty() ? "Not initialised" : mName.c_str(); }

    int mParentIndex;
    std::string mName;
    int mStructure;
    int mDataType;
    int mRowNbr;
    int mColNbr;
    // Values, row-major, mRowNbr * mColNbr of the field's type; flags one byte per element.
    std::vector<int32_t> mIntData;
    std::vector<double> mDoubleData;
    std::vector<std::string> mStringData;
    std::vector<CDescriptionField*> mSubFields;  // MULTIPLE only; owned by the section
    std::vector<uint8_t> mSet;

private:
    /// Index of (row, col) for a read of type theType; reports the failures of a read.
    std::size_t readIndex(int theRow, int theCol, int theType, bool theNForm) const;
    /// Index of (row, col) for a write of type theType; reports the failures of a write.
    std::size_t writeIndex(int theRow, int theCol, int theType);
    [[noreturn]] void fail(int theId) const;
};

/// A named list of fields loaded from a key file.
class CDescriptionSection {
public:
    CDescriptionSection() = default;
    /// Builds the section and loads its fields from <QORVEX_KEY_FILES_DIR><name>.key.
    explicit CDescriptionSection(const char* theName);
    /// Builds the section from a given key file.
    CDescriptionSection(const char* theName, const char* theKeyFile);
    CDescriptionSection(const CDescriptionSection&) = delete;
    CDescriptionSection& operator=(const CDescriptionSection&) = delete;

    /// Reads the field list from a key file; false when the file has no header of that name (a
    /// null or empty name takes the first header). A missing key file is failure 261122, a
    /// 5050th field 848640, a wrong type token 848644, missing sub-field names 848640.
    bool loadKeys(const char* theKeyFile, const char* theSectionName);

    /// The first field of that name (sub-fields included), or null.
    CDescriptionField* findField(const char* theName) const;
    /// Copies fields of the same names (not the scale factors); false when the names differ.
    bool copyFrom(const CDescriptionSection& theOther);
    void reset();
    /// True when at least one field of its own (not a sub-field) is initialised; a section with
    /// none is not written.
    bool hasInitialisedField() const;
    void print(bool theWithEmpty = true) const;

    const char* name() const { return mName.empty() ? "Not initialised" : mName.c_str(); }

    std::string mName;
    int mFieldNbr = 0;
    std::vector<std::unique_ptr<CDescriptionField>> mFields;
    std::string mRootTag = "HEADER_INFO";
};

/// A header: sections in the order of the names it was built with.
class CDescriptionHeader {
public:
    CDescriptionHeader();
    /// Sections by name, each loading its key file; a null name ends the list. Root tag "HEADER_INFO".
    CDescriptionHeader(std::initializer_list<const char*> theSections);
    CDescriptionHeader(const std::vector<std::string>& theSections);
    /// The same with another root tag.
    CDescriptionHeader(const char* theRootTag, std::initializer_list<const char*> theSections);
    CDescriptionHeader(const CDescriptionHeader&) = delete;
    CDescriptionHeader& operator=(const CDescriptionHeader&) = delete;

    /// A header of all 21 sections.
    static std::unique_ptr<CDescriptionHeader> makeFull();

    /// Throws away what the header held and builds these sections.
    void init(const std::vector<std::string>& theSections);

    /// "Section.Field" searches that section only; "Field" every section in order. Never returns
    /// null: an unknown key prints the header twice to the trace and is failure 848642.
    CDescriptionField& getField(const char* theKey) const;
    CDescriptionField& operator[](const char* theKey) const { return getField(theKey); }
    CDescriptionField& operator[](const std::string& theKey) const { return getField(theKey.c_str()); }
    /// The same, null for an unknown key.
    CDescriptionField* findField(const char* theKey) const;

    CDescriptionSection* getSection(const char* theName) const;
    CDescriptionSection* getSection(int theIndex) const;

    void reset();
    /// For each of theOther's sections that this header has too, copies the fields; 848640 on failure.
    void copyFrom(const CDescriptionHeader& theOther, bool theResetFirst);
    void print(bool theWithEmpty = true) const;

    /// Reads a header file: "<name>.sml" first, else "<name>_hdr" or the path as given, each in XML
    /// or in the old text form. False when nothing is found; with theMandatory a file that can't be
    /// parsed is failure 261121 (XML) or 261122 (text).
    bool read(const char* thePath, bool theMandatory);
    /// Writes "<name>.sml" (atomically), the text form as well when asked, then calls the ENVI
    /// header writer registered by fqorvSetEnviHeaderWriter with thePath. Result of the XML write.
    bool write(const char* thePath, bool theMandatory, bool theAlsoText);
    /// The XML writer alone. theNewFile false on an existing file replaces only the sections that
    /// are written and keeps the file's other lines.
    bool writeXML(const char* thePath, bool theNewFile, bool theMandatory);
    /// Reads an XML header file as it stands (no name handling).
    bool readXML(const char* thePath, bool theMandatory);
    /// Reads one section out of an XML file into a section object.
    bool readFromXMLFile(const char* thePath, CDescriptionSection& theSection);
    /// Text form of old headers.
    bool readText(const char* thePath, bool theMandatory);
    bool writeText(const char* thePath, bool theMandatory);

    /// Checks that every field named by the mandatory file holds a value. A missing field is written
    /// to the log; theFailHard makes it failure 848641, otherwise the result is false.
    bool checkMandatory(const char* theName, bool theFailHard);

    int mSectionNbr = 0;
    std::vector<std::unique_ptr<CDescriptionSection>> mSections;
    std::string mRootTag = "HEADER_INFO";
};

/// The header of a step's input: all 21 sections, or the "sar_processing" section alone for a
/// processing parameter file (theParameters). A file that cannot be read traces theWords and the
/// name and is failure 261122.
std::unique_ptr<CDescriptionHeader> fqorvReadStepHeader(const std::string& theName, const char* theWords, bool theParameters);

/// True when the header has the field theKey and it holds a value: what "present" means for a field.
bool fqorvHasValue(const CDescriptionHeader& theHeader, const char* theKey);

/// User keys of "RasterInfo.OtherInfo", a string matrix of {key, value} rows.
/// Lookup scans the rows in order and compares over the length of the key; false when no row
/// matches or the header has no such field.
bool fqorvGetUserKey(const CDescriptionHeader& theHeader, const char* theKey, std::string& theValue);
/// Replaces the row whose key equals theKey exactly, or appends a row (the old rows are kept).
void fqorvSetUserKey(CDescriptionHeader& theHeader, const char* theKey, const char* theValue);

/// Called by CDescriptionHeader::write after the header file, with the path given to write: the
/// raster library registers its ENVI header writer here (the store does not depend on it).
using QorvHeaderWrittenHook = void (*)(const char* thePath);
/// Registers the hook (null: none); returns the previous one.
QorvHeaderWrittenHook fqorvSetEnviHeaderWriter(QorvHeaderWrittenHook theHook);

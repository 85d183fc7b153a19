// The text form of old header files, read and written.
//
// A section starts at a line with "[" in its first or second column; field lines are
// "Name = value"; ";" starts a comment. Strings stand in double quotes, a vector in braces with
// its elements separated by blanks ("{1 2 3}"), a matrix as braces of row braces ("{{1 2} {3 4}}").
// Not-a-number is "NaN".
#include <cstring>
#include <string_view>

#include "qorv_description_section.h"
#include "qorv_description_xml.h"
#include "qorv_enviroment.h"
#include "qorv_errors.h"
#include "qorv_generic_utility.h"
#include "qorv_store_io.h"

namespace {

bool fIsSeparator(char c) { return c == ' ' || c == '\r' || c == '\t' || c == '\n'; }

/// The section name of a header line ("[" in the first or second column), or false.
bool fTextSectionName(std::string_view theLine, std::string& theName)
{
    std::size_t aOpen;
    if (!theLine.empty() && theLine[0] == '[') aOpen = 0;
    else if (theLine.size() > 1 && theLine[1] == '[') aOpen = 1;
    else return false;
    std::size_t p = aOpen;
    while (p < theLine.size() && (theLine[p] == '[' || theLine[p] == ' ' || theLine[p] == '\t')) ++p;
    std::size_t e = p;
    while (e < theLine.size() && theLine[e] != ']' && !fIsSeparator(theLine[e])) ++e;
    theName.assign(theLine.substr(p, e - p));
    return true;
}

/// The line without its comment: ";" outside double quotes starts it.
std::string_view fWithoutComment(std::string_view theLine)
{
    bool aQuoted = false;
    for (std::size_t i = 0; i < theLine.size(); ++i) {
        if (theLine[i] == '"') aQuoted = !aQuoted;
        else if (theLine[i] == ';' && !aQuoted) return theLine.substr(0, i);
    }
    return theLine;
}

std::string_view fTrimText(std::string_view theText)
{
    while (!theText.empty() && fIsSeparator(theText.front())) theText.remove_prefix(1);
    while (!theText.empty() && fIsSeparator(theText.back())) theText.remove_suffix(1);
    return theText;
}

/// Walks a value text: tokens are cut by blanks, carriage returns, tabs and line feeds; a token
/// in quotes reaches up to the closing quote or to a closing brace.
class CValueCursor {
public:
    explicit CValueCursor(std::string_view theText) : mText(theText) {}
    void skip()
    {
        while (mPos < mText.size() && fIsSeparator(mText[mPos])) ++mPos;
    }
    bool atEnd()
    {
        skip();
        return mPos >= mText.size();
    }
    bool take(char c)
    {
        skip();
        if (mPos < mText.size() && mText[mPos] == c) {
            ++mPos;
            return true;
        }
        return false;
    }
    bool peek(char c)
    {
        skip();
        return mPos < mText.size() && mText[mPos] == c;
    }
    /// The next token; theQuoted tells whether it stood in quotes. False at the end or at a brace.
    bool token(std::string& theToken, bool& theQuoted)
    {
        skip();
        if (mPos >= mText.size() || mText[mPos] == '{' || mText[mPos] == '}') return false;
        theQuoted = mText[mPos] == '"';
        if (theQuoted) {
            const std::size_t aStart = ++mPos;
            while (mPos < mText.size() && mText[mPos] != '"' && mText[mPos] != '}') ++mPos;
            theToken.assign(mText.substr(aStart, mPos - aStart));
            if (mPos < mText.size() && mText[mPos] == '"') ++mPos;
            return true;
        }
        const std::size_t aStart = mPos;
        while (mPos < mText.size() && !fIsSeparator(mText[mPos]) && mText[mPos] != '}' && mText[mPos] != '{') ++mPos;
        theToken.assign(mText.substr(aStart, mPos - aStart));
        return true;
    }

private:
    std::string_view mText;
    std::size_t mPos = 0;
};

[[noreturn]] void fBadText(const CDescriptionField& theField)
{
    fdfTrace("Data Type ID : %d\n", theField.mDataType);
    theField.print(true);
    QORV_FATAL(CQORV_ERR_FIELD_TYPE, theField.name());
}

void fSetFromToken(CDescriptionField& theField, int theRow, int theCol, const std::string& theToken)
{
    switch (theField.mDataType) {
    case CQORV_DT_INTEGER: {
        int aValue = 0;
        if (!fqorvParseInteger(theToken, aValue)) fBadText(theField);
        theField.setValue(theRow, theCol, aValue);
        break;
    }
    case CQORV_DT_DOUBLE: {
        double aValue = 0.0;
        if (!fqorvParseDouble(theToken, aValue)) fBadText(theField);
        theField.setValue(theRow, theCol, aValue);
        break;
    }
    case CQORV_DT_STRING: theField.setValue(theRow, theCol, theToken.c_str()); break;
    default: fBadText(theField);
    }
}

/// The tokens up to a closing brace (which is taken).
std::vector<std::string> fBraceTokens(CValueCursor& theCursor, const CDescriptionField& theField)
{
    std::vector<std::string> aTokens;
    std::string aToken;
    bool aQuoted = false;
    while (theCursor.token(aToken, aQuoted)) aTokens.push_back(aToken);
    if (!theCursor.take('}')) fBadText(theField);
    return aTokens;
}

void fReadTextValue(CDescriptionField& theField, std::string_view theValue)
{
    CValueCursor aCursor(theValue);
    if (aCursor.atEnd()) return;  // "Name =" with nothing: the field stays empty
    std::string aToken;
    bool aQuoted = false;
    switch (theField.mStructure) {
    case CQORV_DS_SCALAR:
        if (!aCursor.token(aToken, aQuoted)) fBadText(theField);
        fSetFromToken(theField, 0, 0, aToken);
        break;
    case CQORV_DS_VECTOR: {
        if (!aCursor.take('{')) fBadText(theField);
        const std::vector<std::string> aTokens = fBraceTokens(aCursor, theField);
        theField.resize(1, static_cast<int>(aTokens.size()));
        for (std::size_t i = 0; i < aTokens.size(); ++i) fSetFromToken(theField, 0, static_cast<int>(i), aTokens[i]);
        break;
    }
    case CQORV_DS_MATRIX: {
        if (!aCursor.take('{')) fBadText(theField);
        std::vector<std::vector<std::string>> aRows;
        if (aCursor.peek('{')) {
            while (aCursor.take('{')) aRows.push_back(fBraceTokens(aCursor, theField));
            if (!aCursor.take('}')) fBadText(theField);
        } else {
            aRows.push_back(fBraceTokens(aCursor, theField));  // a flat list is one row
        }
        std::size_t aCols = 0;
        for (const auto& aRow : aRows) aCols = std::max(aCols, aRow.size());
        theField.resize(static_cast<int>(aRows.size()), static_cast<int>(aCols));
        for (std::size_t r = 0; r < aRows.size(); ++r)
            for (std::size_t c = 0; c < aRows[r].size(); ++c)
                fSetFromToken(theField, static_cast<int>(r), static_cast<int>(c), aRows[r][c]);
        break;
    }
    default: break;  // a MULTIPLE is read through its sub-fields
    }
}

/// Reads the field lines of one section, from the line after its header to the next header.
void fReadTextSection(const std::vector<std::string>& theLines, std::size_t theFirst, CDescriptionSection& theSection)
{
    std::string aName;
    for (std::size_t i = theFirst; i < theLines.size(); ++i) {
        const std::string_view aLine = fWithoutComment(theLines[i]);
        if (fTextSectionName(aLine, aName)) break;
        const std::size_t aEqual = aLine.find('=');
        if (aEqual == std::string_view::npos) continue;
        const std::string aFieldName(fTrimText(aLine.substr(0, aEqual)));
        CDescriptionField* aField = theSection.findField(aFieldName.c_str());
        if (!aField || aField->mStructure == CQORV_DS_MULTIPLE) continue;
        fReadTextValue(*aField, aLine.substr(aEqual + 1));
    }
}

void fAppendTextValue(std::string& theOut, const CDescriptionField& theField, std::size_t theIndex)
{
    switch (theField.mDataType) {
    case CQORV_DT_INTEGER: theOut += std::to_string(theField.mIntData[theIndex]); break;
    case CQORV_DT_DOUBLE: fqorvAppendDouble(theOut, theField.mDoubleData[theIndex]); break;
    case CQORV_DT_STRING:
        theOut += '"';
        if (theField.mSet[theIndex]) theOut += theField.mStringData[theIndex];
        theOut += '"';
        break;
    default: break;
    }
}

/// "[Name]" and the lines of its initialised fields (sub-fields by their own names).
std::string fTextSection(const CDescriptionSection& theSection)
{
    std::string aText = "[" + theSection.mName + "]\n";
    for (const auto& aField : theSection.mFields) {
        if (aField->mStructure == CQORV_DS_MULTIPLE || !aField->isInitialised()) continue;
        aText += aField->mName + " = ";
        const std::size_t aCols = static_cast<std::size_t>(aField->mColNbr);
        if (aField->mStructure == CQORV_DS_SCALAR) {
            fAppendTextValue(aText, *aField, 0);
        } else if (aField->mStructure == CQORV_DS_VECTOR) {
            aText += '{';
            for (std::size_t i = 0; i < aCols; ++i) {
                if (i) aText += ' ';
                fAppendTextValue(aText, *aField, i);
            }
            aText += '}';
        } else {
            aText += '{';
            for (std::size_t r = 0; r < static_cast<std::size_t>(aField->mRowNbr); ++r) {
                aText += r ? " {" : "{";
                for (std::size_t c = 0; c < aCols; ++c) {
                    if (c) aText += ' ';
                    fAppendTextValue(aText, *aField, r * aCols + c);
                }
                aText += '}';
            }
            aText += '}';
        }
        aText += '\n';
    }
    return aText;
}

}  // namespace

bool CDescriptionHeader::readText(const char* thePath, bool theMandatory)
{
    const std::string aPath = thePath ? thePath : "";
    std::vector<std::string> aLines;
    if (!fqorvReadAllLines(aPath, aLines)) {
        fdfTrace("\nFile : %s Not Found\n\n", aPath.c_str());
        if (theMandatory) QORV_FATAL(CQORV_ERR_MISSING_FILE, aPath.c_str());
        return false;
    }
    reset();
    std::string aName;
    for (const auto& aSection : mSections) {
        std::size_t aHeader = aLines.size();
        for (std::size_t i = 0; i < aLines.size() && aHeader == aLines.size(); ++i)
            if (fTextSectionName(fWithoutComment(aLines[i]), aName) && aName == aSection->mName) aHeader = i;
        if (aHeader == aLines.size()) {
            fdfTrace("Section [%s] can't be read from %s\n", aSection->name(), aPath.c_str());
            if (theMandatory) {
                print(true);
                QORV_FATAL(CQORV_ERR_MISSING_FILE, aPath.c_str());
            }
            return false;
        }
        fReadTextSection(aLines, aHeader + 1, *aSection);
    }
    return true;
}

bool CDescriptionHeader::writeText(const char* thePath, bool theMandatory)
{
    const std::string aPath = thePath ? thePath : "";
    std::vector<std::string> aLines;
    if (fqorvFileExists(aPath)) fqorvReadAllLines(aPath, aLines);
    // Each section replaces its old lines (header to the next header); the others are kept, and a
    // section the file lacks goes at its end.
    std::vector<std::string> aOut;
    std::vector<bool> aPlaced(mSections.size(), false);
    std::string aName;
    for (std::size_t i = 0; i < aLines.size(); ++i) {
        std::size_t aSectionIndex = mSections.size();
        if (fTextSectionName(fWithoutComment(aLines[i]), aName))
            for (std::size_t s = 0; s < mSections.size(); ++s)
                if (!aPlaced[s] && mSections[s]->mName == aName) aSectionIndex = s;
        if (aSectionIndex == mSections.size()) {
            aOut.push_back(aLines[i] + "\n");
            continue;
        }
        aPlaced[aSectionIndex] = true;
        aOut.push_back(fTextSection(*mSections[aSectionIndex]));
        while (i + 1 < aLines.size() && !fTextSectionName(fWithoutComment(aLines[i + 1]), aName)) ++i;
    }
    for (std::size_t s = 0; s < mSections.size(); ++s)
        if (!aPlaced[s]) aOut.push_back(fTextSection(*mSections[s]));
    const bool aOk = !aPath.empty() && fqorvWriteAtomically(aPath, [&](FILE* theFile) {
        for (const std::string& aPiece : aOut)
            if (std::fwrite(aPiece.data(), 1, aPiece.size(), theFile) != aPiece.size()) return false;
        return true;
    });
    if (!aOk) {
        fdfTrace("Error while writing the text header file %s\n", aPath.c_str());
        if (theMandatory) QORV_FATAL(CQORV_ERR_WRITE_FILE, aPath.c_str());
    }
    return aOk;
}

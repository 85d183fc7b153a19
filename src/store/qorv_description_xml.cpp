// Header files in XML: the writer, the expat-based parser with its pre-pass, the reader, the name
// handling of read and write, the ENVI hook and the derivation of "DEMCoordinates".
#include "qorv_description_xml.h"

#include <algorithm>
#include <charconv>
#include <cmath>
#include <cstdlib>
#include <cstring>
#include <filesystem>
#include <system_error>

#include <expat.h>

#include "qorv_description_section.h"
#include "qorv_enviroment.h"
#include "qorv_errors.h"
#include "qorv_generic_utility.h"
#include "qorv_store_io.h"

namespace {

QorvHeaderWrittenHook gEnviHeaderWriter = nullptr;

bool fIsBlank(char c) { return c == ' ' || c == '\t' || c == '\r' || c == '\n'; }

std::string_view fTrim(std::string_view theText)
{
    while (!theText.empty() && fIsBlank(theText.front())) theText.remove_prefix(1);
    while (!theText.empty() && fIsBlank(theText.back())) theText.remove_suffix(1);
    return theText;
}

bool fEqualNoCase(std::string_view a, const char* b)
{
    const std::size_t aLen = std::strlen(b);
    if (a.size() != aLen) return false;
    for (std::size_t i = 0; i < aLen; ++i)
        if (std::tolower(static_cast<unsigned char>(a[i])) != std::tolower(static_cast<unsigned char>(b[i]))) return false;
    return true;
}

}  // namespace

QorvHeaderWrittenHook fqorvSetEnviHeaderWriter(QorvHeaderWrittenHook theHook)
{
    QorvHeaderWrittenHook aOld = gEnviHeaderWriter;
    gEnviHeaderWriter = theHook;
    return aOld;
}

// ------------------------------------------------------------------------------------------------
// Value texts

void fqorvAppendDouble(std::string& theOut, double theValue)
{
    if (std::isnan(theValue)) {
        theOut += "NaN";
        return;
    }
    char aBuffer[128];
    const auto aResult = std::to_chars(aBuffer, aBuffer + sizeof aBuffer, theValue, std::chars_format::general,
                                       CQORV_XML_DOUBLE_DIGITS);
    theOut.append(aBuffer, aResult.ptr);
}

std::string fqorvFormatDouble(double theValue)
{
    std::string aText;
    fqorvAppendDouble(aText, theValue);
    return aText;
}

bool fqorvParseInteger(std::string_view theText, int& theValue)
{
    theText = fTrim(theText);
    if (!theText.empty() && theText.front() == '+') theText.remove_prefix(1);
    if (theText.empty()) return false;
    int aValue = 0;
    const auto aResult = std::from_chars(theText.data(), theText.data() + theText.size(), aValue, 10);
    if (aResult.ec != std::errc() || aResult.ptr != theText.data() + theText.size()) return false;
    theValue = aValue;
    return true;
}

bool fqorvParseDouble(std::string_view theText, double& theValue)
{
    theText = fTrim(theText);
    if (fEqualNoCase(theText, "NaN") || fEqualNoCase(theText, "-NaN") || fEqualNoCase(theText, "+NaN")) {
        theValue = std::nan("");
        return true;
    }
    if (!theText.empty() && theText.front() == '+') theText.remove_prefix(1);
    if (theText.empty()) return false;
    double aValue = 0.0;
    const auto aResult = std::from_chars(theText.data(), theText.data() + theText.size(), aValue);
    if (aResult.ec == std::errc() && aResult.ptr == theText.data() + theText.size()) {
        theValue = aValue;
        return true;
    }
    // Forms that from_chars leaves to the C library (hexadecimal, out-of-range values).
    const std::string aCopy(theText);
    char* aEnd = nullptr;
    aValue = std::strtod(aCopy.c_str(), &aEnd);
    if (aEnd != aCopy.c_str() + aCopy.size()) return false;
    theValue = aValue;
    return true;
}

// ------------------------------------------------------------------------------------------------
// Pre-pass and its reverse

namespace {

struct CEntity {
    const char* mEntity;
    const char* mMark;
    char mChar;
};
constexpr CEntity CENTITIES[] = {
    {"&quot;", "##quot", '"'}, {"&apos;", "##apos", '\''}, {"&amp;", "##amp", '&'},
    {"&lt;", "##lt", '<'},     {"&gt;", "##gt", '>'},
};
constexpr const char* CBIG_MARK = "####BIG";
constexpr std::size_t CBIG_MARK_LEN = 7;

bool fNeedsPrepass(unsigned char c) { return c == '&' || c >= 0x80; }

}  // namespace

bool fqorvXmlPrepass(std::string_view theLine, std::string& theOut)
{
    std::size_t i = 0;
    while (i < theLine.size() && !fNeedsPrepass(static_cast<unsigned char>(theLine[i]))) ++i;
    if (i == theLine.size()) return false;
    theOut.assign(theLine.data(), i);
    for (; i < theLine.size(); ++i) {
        const unsigned char c = static_cast<unsigned char>(theLine[i]);
        if (c == '&') {
            bool aDone = false;
            for (const CEntity& aEntity : CENTITIES) {
                const std::size_t aLen = std::strlen(aEntity.mEntity);
                if (theLine.compare(i, aLen, aEntity.mEntity) == 0) {
                    theOut += aEntity.mMark;
                    i += aLen - 1;
                    aDone = true;
                    break;
                }
            }
            if (!aDone) theOut += '&';
        } else if (c >= 0x80 && c <= 0xA4) {
            theOut += CBIG_MARK;
            theOut += static_cast<char>((c + 0xB0) & 0xFF);
        } else if (c == 0xE9) {
            theOut += 'e';
        } else if (c == 0xF1) {
            theOut += 'n';
        } else if (c == 0xFC) {
            theOut += 'u';
        } else if (c == 0xF6) {
            theOut += 'o';
        } else if (c == 0xB0) {
            theOut += 'd';
        } else {
            theOut += static_cast<char>(c);
        }
    }
    return true;
}

std::string fqorvXmlUnescape(std::string_view theText)
{
    if (theText.find("##") == std::string_view::npos) return std::string(theText);
    std::string aOut;
    aOut.reserve(theText.size());
    for (std::size_t i = 0; i < theText.size();) {
        if (theText[i] == '#') {
            if (theText.compare(i, CBIG_MARK_LEN, CBIG_MARK) == 0 && i + CBIG_MARK_LEN < theText.size()) {
                // The marked byte is not given back: the output position's low byte takes its
                // place and one output byte is skipped (left zero), so for every reader of the
                // text it ends there. Such texts don't survive a round trip; nothing depends on it.
                aOut += static_cast<char>(aOut.size() & 0xFF);
                aOut += '\0';
                i += CBIG_MARK_LEN + 1;
                continue;
            }
            bool aDone = false;
            for (const CEntity& aEntity : CENTITIES) {
                const std::size_t aLen = std::strlen(aEntity.mMark);
                if (theText.compare(i, aLen, aEntity.mMark) == 0) {
                    aOut += aEntity.mChar;
                    i += aLen;
                    aDone = true;
                    break;
                }
            }
            if (aDone) continue;
        }
        aOut += theText[i++];
    }
    return aOut;
}

namespace {

/// Bytes that the pre-pass rewrites before the parser sees them.
bool fPrepassByte(unsigned char c) { return (c >= 0x80 && c <= 0xA4) || c == 0xE9 || c == 0xF1 || c == 0xFC || c == 0xF6 || c == 0xB0; }

/// The pre-pass turns these single bytes into plain letters.
bool fPrepassLetter(unsigned char c) { return c == 0xE9 || c == 0xF1 || c == 0xFC || c == 0xF6 || c == 0xB0; }

/// Length of the UTF-8 character at theText[i] when it is well formed, allowed in XML and passes the
/// pre-pass untouched; 0 otherwise.
std::size_t fKeptUtf8Length(std::string_view theText, std::size_t i)
{
    const unsigned char c = static_cast<unsigned char>(theText[i]);
    const std::size_t n = (c >= 0xC2 && c <= 0xDF) ? 2 : (c >= 0xE0 && c <= 0xEF) ? 3 : (c >= 0xF0 && c <= 0xF4) ? 4 : 0;
    if (n == 0 || fPrepassByte(c) || i + n > theText.size()) return 0;
    unsigned long aCode = c & (n == 2 ? 0x1F : n == 3 ? 0x0F : 0x07);
    for (std::size_t k = 1; k < n; ++k) {
        const unsigned char b = static_cast<unsigned char>(theText[i + k]);
        if ((b & 0xC0) != 0x80 || fPrepassByte(b)) return 0;
        aCode = (aCode << 6) | (b & 0x3F);
    }
    const unsigned long aLeast = n == 2 ? 0x80 : n == 3 ? 0x800 : 0x10000;
    if (aCode < aLeast || aCode > 0x10FFFF || (aCode >= 0xD800 && aCode <= 0xDFFF) || aCode == 0xFFFE || aCode == 0xFFFF)
        return 0;
    return n;
}

}  // namespace

std::string fqorvXmlEscape(std::string_view theText)
{
    std::string aOut;
    aOut.reserve(theText.size() + 8);
    for (std::size_t i = 0; i < theText.size(); ++i) {
        const char c = theText[i];
        const unsigned char u = static_cast<unsigned char>(c);
        switch (c) {
        case '&': aOut += "&amp;"; continue;
        case '<': aOut += "&lt;"; continue;
        case '>': aOut += "&gt;"; continue;
        case '"': aOut += "&quot;"; continue;
        case '\'': aOut += "&apos;"; continue;
        default: break;
        }
        if (u < 0x20 && c != '\t' && c != '\n' && c != '\r') {
            aOut += ' ';  // XML carries no control characters
        } else if (u < 0x80 || fPrepassLetter(u)) {
            aOut += c;
        } else if (const std::size_t n = fKeptUtf8Length(theText, i)) {
            aOut.append(theText.substr(i, n));
            i += n - 1;
        } else {
            aOut += '?';  // a byte that would not come through the pre-pass and the parser
        }
    }
    return aOut;
}

// ------------------------------------------------------------------------------------------------
// The parser

const char* CQorvXmlTree::attribute(int theNode, const char* theName) const
{
    const CQorvXmlNode& aNode = mNodes[static_cast<std::size_t>(theNode)];
    for (int i = 0; i < aNode.mAttrCount; ++i) {
        const CQorvXmlAttribute& aAttr = mAttributes[static_cast<std::size_t>(aNode.mAttrBegin + i)];
        if (aAttr.mName == theName) return aAttr.mValue.c_str();
    }
    return nullptr;
}

int CQorvXmlTree::find(const char* theName, int theFrom, int theEnd) const
{
    const int aEnd = std::min(theEnd, static_cast<int>(mNodes.size()));
    for (int i = std::max(theFrom, 0); i < aEnd; ++i)
        if (mNodes[static_cast<std::size_t>(i)].mName == theName) return i;
    return -1;
}

std::vector<int> CQorvXmlTree::children(int theNode) const
{
    std::vector<int> aChildren;
    const int aEnd = mNodes[static_cast<std::size_t>(theNode)].mEnd;
    for (int i = theNode + 1; i < aEnd; i = mNodes[static_cast<std::size_t>(i)].mEnd) aChildren.push_back(i);
    return aChildren;
}

namespace {

struct CParseState {
    CQorvXmlTree* mTree = nullptr;
    XML_Parser mParser = nullptr;
    std::vector<int> mStack;
    int mMaxNodes = 0;
    int mMaxDepth = 0;
    bool mOverflow = false;
    bool mTextOpen = false;  // the open node's text run may still grow
};

void XMLCALL fOnStart(void* theData, const XML_Char* theName, const XML_Char** theAttributes)
{
    auto* aState = static_cast<CParseState*>(theData);
    CQorvXmlTree& aTree = *aState->mTree;
    if (static_cast<int>(aTree.mNodes.size()) >= aState->mMaxNodes ||
        static_cast<int>(aState->mStack.size()) >= aState->mMaxDepth) {
        aState->mOverflow = true;
        XML_StopParser(aState->mParser, XML_FALSE);
        return;
    }
    const int aIndex = static_cast<int>(aTree.mNodes.size());
    CQorvXmlNode& aNode = aTree.mNodes.emplace_back();
    aNode.mDepth = static_cast<int>(aState->mStack.size());
    aNode.mName = theName;
    aNode.mEnd = aIndex + 1;
    aNode.mAttrBegin = static_cast<int>(aTree.mAttributes.size());
    for (int i = 0; theAttributes && theAttributes[i]; i += 2)
        aTree.mAttributes.push_back({theAttributes[i], theAttributes[i + 1] ? theAttributes[i + 1] : ""});
    aNode.mAttrCount = static_cast<int>(aTree.mAttributes.size()) - aNode.mAttrBegin;
    aState->mStack.push_back(aIndex);
    aState->mTextOpen = false;
}

void XMLCALL fOnEnd(void* theData, const XML_Char*)
{
    auto* aState = static_cast<CParseState*>(theData);
    if (aState->mStack.empty()) return;
    aState->mTree->mNodes[static_cast<std::size_t>(aState->mStack.back())].mEnd =
        static_cast<int>(aState->mTree->mNodes.size());
    aState->mStack.pop_back();
    aState->mTextOpen = false;
}

// Keeps one text per node: the first run of character data, without its leading blanks and tabs.
// Expat hands a run over in pieces (at line breaks); they are joined. Whitespace alone is no text,
// and text after a child element is dropped.
void XMLCALL fOnText(void* theData, const XML_Char* theText, int theLen)
{
    auto* aState = static_cast<CParseState*>(theData);
    if (aState->mStack.empty() || theLen <= 0) return;
    CQorvXmlNode& aNode = aState->mTree->mNodes[static_cast<std::size_t>(aState->mStack.back())];
    if (aState->mTextOpen) {
        aNode.mText.append(theText, static_cast<std::size_t>(theLen));
        return;
    }
    if (aNode.mHasText) return;
    int aStart = 0;
    while (aStart < theLen && fIsBlank(theText[aStart])) ++aStart;
    if (aStart == theLen) return;
    aNode.mText.assign(theText + aStart, static_cast<std::size_t>(theLen - aStart));
    aNode.mHasText = true;
    aState->mTextOpen = true;
}

/// Owns an expat parser.
struct CExpatParser {
    XML_Parser mParser = XML_ParserCreate(nullptr);
    ~CExpatParser()
    {
        if (mParser) XML_ParserFree(mParser);
    }
};

}  // namespace

std::unique_ptr<CQorvXmlTree> fqorv_xml_parser(int theMaxNodes, int theMaxDepth, const char* thePath, int theLineLength)
{
    FILE* aFile = thePath ? std::fopen(thePath, "rb") : nullptr;
    if (!aFile) {
        fdfTrace("\nFile : %s Not Found\n\n", thePath ? thePath : "");
        return nullptr;
    }
    CStdioFile aCloser(aFile);
    auto aTree = std::make_unique<CQorvXmlTree>();
    {
        std::error_code aError;
        const auto aSize = std::filesystem::file_size(thePath, aError);
        if (!aError) {
            const std::size_t aGuess = std::min<std::size_t>(aSize / 40 + 16, static_cast<std::size_t>(std::max(theMaxNodes, 1)));
            aTree->mNodes.reserve(aGuess);
            aTree->mAttributes.reserve(aGuess);
        }
    }
    CExpatParser aExpat;
    if (!aExpat.mParser) return nullptr;
    CParseState aState;
    aState.mTree = aTree.get();
    aState.mParser = aExpat.mParser;
    aState.mMaxNodes = theMaxNodes;
    aState.mMaxDepth = theMaxDepth;
    XML_SetUserData(aExpat.mParser, &aState);
    XML_SetElementHandler(aExpat.mParser, fOnStart, fOnEnd);
    XML_SetCharacterDataHandler(aExpat.mParser, fOnText);

    CPoolBufferLease aLease;
    char* aLine = aLease.data();
    const int aLineSize = std::max(2, std::min(theLineLength > 0 ? theLineLength : 2, static_cast<int>(aLease.size())));
    // Lines are rewritten one by one and handed to expat in chunks of about 64 KiB.
    constexpr std::size_t CCHUNK = 1 << 16;
    std::string aRewritten, aChunk;
    aChunk.reserve(CCHUNK + static_cast<std::size_t>(aLineSize));
    bool aFailed = false;
    bool aEnd = false;
    while (!aFailed && !aEnd) {
        aEnd = std::fgets(aLine, aLineSize, aFile) == nullptr;
        if (!aEnd) {
            const std::size_t aLen = std::strlen(aLine);
            if (fqorvXmlPrepass(std::string_view(aLine, aLen), aRewritten)) aChunk += aRewritten;
            else aChunk.append(aLine, aLen);
        }
        if (aChunk.size() >= CCHUNK || aEnd) {
            if (XML_Parse(aExpat.mParser, aChunk.data(), static_cast<int>(aChunk.size()), aEnd ? XML_TRUE : XML_FALSE) ==
                XML_STATUS_ERROR)
                aFailed = true;
            aChunk.clear();
        }
    }
    if (aState.mOverflow) {
        fdfTrace("XML file %s holds more than %d nodes or %d levels\n", thePath, theMaxNodes, theMaxDepth);
        return nullptr;
    }
    if (aFailed) {
        fdfTrace("%s at line %d\n%s\n", XML_ErrorString(XML_GetErrorCode(aExpat.mParser)),
                 static_cast<int>(XML_GetCurrentLineNumber(aExpat.mParser)), thePath);
        return nullptr;
    }
    return aTree;
}

// ------------------------------------------------------------------------------------------------
// The writer

namespace {

/// Buffers the text of a file and hands it to stdio in large pieces.
class CXmlSink {
public:
    explicit CXmlSink(FILE* theFile) : mFile(theFile) { mText.reserve(CFLUSH_SIZE + 4096); }
    std::string& text() { return mText; }
    void indent(int theLevel) { mText.append(static_cast<std::size_t>(theLevel) * 3, ' '); }
    void line(int theLevel, std::string_view theText)
    {
        indent(theLevel);
        mText.append(theText);
        mText += '\n';
        flushIfFull();
    }
    void flushIfFull()
    {
        if (mText.size() >= CFLUSH_SIZE) flush();
    }
    bool flush()
    {
        if (!mText.empty() && std::fwrite(mText.data(), 1, mText.size(), mFile) != mText.size()) mOk = false;
        mText.clear();
        return mOk;
    }

private:
    static constexpr std::size_t CFLUSH_SIZE = 1 << 20;
    FILE* mFile;
    std::string mText;
    bool mOk = true;
};

const char* fTypeWord(int theDataType)
{
    switch (theDataType) {
    case CQORV_DT_INTEGER: return "Integer";
    case CQORV_DT_DOUBLE: return "Double";
    case CQORV_DT_STRING: return "String";
    default: return "EFDT";
    }
}

void fAppendInt(std::string& theOut, long theValue)
{
    char aBuffer[32];
    const auto aResult = std::to_chars(aBuffer, aBuffer + sizeof aBuffer, theValue);
    theOut.append(aBuffer, aResult.ptr);
}

/// The text of element theIndex of a field; an unset string is written as two double quotes.
void fAppendValue(std::string& theOut, const CDescriptionField& theField, std::size_t theIndex)
{
    const bool aInRange = theIndex < theField.mSet.size();
    switch (theField.mDataType) {
    case CQORV_DT_INTEGER: fAppendInt(theOut, aInRange ? theField.mIntData[theIndex] : 0); break;
    case CQORV_DT_DOUBLE: fqorvAppendDouble(theOut, aInRange ? theField.mDoubleData[theIndex] : 0.0); break;
    case CQORV_DT_STRING:
        if (aInRange && theField.mSet[theIndex]) theOut += fqorvXmlEscape(theField.mStringData[theIndex]);
        else theOut += fqorvXmlEscape("\"\"");
        break;
    default: break;
    }
}

/// "<Name>value</Name>" at a level.
void fValueLine(CXmlSink& theSink, int theLevel, const std::string& theName, const CDescriptionField& theField,
                std::size_t theIndex)
{
    std::string& aText = theSink.text();
    theSink.indent(theLevel);
    aText += '<';
    aText += theName;
    aText += '>';
    fAppendValue(aText, theField, theIndex);
    aText += "</";
    aText += theName;
    aText += ">\n";
}

/// "<ValueT ID = "i">value</ValueT>" at a level.
void fIdValueLine(CXmlSink& theSink, int theLevel, const char* theValueTag, int theId,
                  const CDescriptionField& theField, std::size_t theIndex)
{
    std::string& aText = theSink.text();
    theSink.indent(theLevel);
    aText += '<';
    aText += theValueTag;
    aText += " ID = \"";
    fAppendInt(aText, theId);
    aText += "\">";
    fAppendValue(aText, theField, theIndex);
    aText += "</";
    aText += theValueTag;
    aText += ">\n";
}

void fWriteVector(CXmlSink& theSink, const CDescriptionField& theField)
{
    const std::string aT = fTypeWord(theField.mDataType);
    const std::string aVector = "Vector" + aT, aValue = "Value" + aT;
    theSink.line(2, "<" + theField.mName + ">");
    theSink.line(3, fqorvStringFormat("<%s %s = \"%d\">", aVector.c_str(), "NumberOfElements", theField.mColNbr));
    for (int i = 0; i < theField.mColNbr; ++i) {
        fIdValueLine(theSink, 4, aValue.c_str(), i, theField, static_cast<std::size_t>(i));
        theSink.flushIfFull();
    }
    theSink.line(3, "</" + aVector + ">");
    theSink.line(2, "</" + theField.mName + ">");
}

void fWriteMatrix(CXmlSink& theSink, const CDescriptionField& theField)
{
    const std::string aT = fTypeWord(theField.mDataType);
    const std::string aMatrix = "Matrix" + aT, aRow = "MatrixRow" + aT, aValue = "Value" + aT;
    theSink.line(2, "<" + theField.mName + ">");
    theSink.line(3, fqorvStringFormat("<%s %s = \"%d\" %s = \"%d\">", aMatrix.c_str(), "NumberOfRows",
                                      theField.mRowNbr, "NumberOfColumns", theField.mColNbr));
    for (int r = 0; r < theField.mRowNbr; ++r) {
        theSink.line(4, fqorvStringFormat("<%s ID = \"%d\">", aRow.c_str(), r));
        for (int c = 0; c < theField.mColNbr; ++c)
            fIdValueLine(theSink, 5, aValue.c_str(), c, theField,
                         static_cast<std::size_t>(r) * static_cast<std::size_t>(theField.mColNbr) + c);
        theSink.line(4, "</" + aRow + ">");
    }
    theSink.line(3, "</" + aMatrix + ">");
    theSink.line(2, "</" + theField.mName + ">");
}

void fWriteMultiple(CXmlSink& theSink, const CDescriptionField& theField)
{
    const auto& aSubs = theField.mSubFields;
    if (aSubs.empty() || !aSubs[0]) return;
    const int aFieldCount = static_cast<int>(aSubs.size());
    theSink.line(2, "<" + theField.mName + ">");
    if (aSubs[0]->mStructure == CQORV_DS_VECTOR) {
        const std::string aOuter = "VectorOfStructs_" + theField.mName;
        const std::string aInner = "VectorOfStructsValues_" + theField.mName;
        const int aCount = aSubs[0]->mColNbr;
        theSink.line(3, fqorvStringFormat("<%s %s = \"%d\" %s = \"%d\">", aOuter.c_str(), "NumberOfElements", aCount,
                                          "NumberOfFields", aFieldCount));
        for (int i = 0; i < aCount; ++i) {
            theSink.line(4, fqorvStringFormat("<%s ID = \"%d\">", aInner.c_str(), i));
            for (const CDescriptionField* aSub : aSubs)
                if (aSub) fValueLine(theSink, 5, aSub->mName, *aSub, static_cast<std::size_t>(i));
            theSink.line(4, "</" + aInner + ">");
        }
        theSink.line(3, "</" + aOuter + ">");
    } else {
        const std::string aStruct = "Struct_" + theField.mName;
        theSink.line(3, fqorvStringFormat("<%s %s = \"%d\">", aStruct.c_str(), "NumberOfFields", aFieldCount));
        for (const CDescriptionField* aSub : aSubs)
            if (aSub) fValueLine(theSink, 4, aSub->mName, *aSub, 0);
        theSink.line(3, "</" + aStruct + ">");
    }
    theSink.line(2, "</" + theField.mName + ">");
}

void fWriteSection(CXmlSink& theSink, const CDescriptionSection& theSection)
{
    theSink.line(1, "<" + theSection.mName + ">");
    for (const auto& aField : theSection.mFields) {
        if (aField->mParentIndex != -1 || !aField->isInitialised()) continue;
        switch (aField->mStructure) {
        case CQORV_DS_SCALAR: fValueLine(theSink, 2, aField->mName, *aField, 0); break;
        case CQORV_DS_VECTOR: fWriteVector(theSink, *aField); break;
        case CQORV_DS_MATRIX: fWriteMatrix(theSink, *aField); break;
        case CQORV_DS_MULTIPLE: fWriteMultiple(theSink, *aField); break;
        default: break;
        }
        theSink.flushIfFull();
    }
    theSink.line(1, "</" + theSection.mName + ">");
}

std::string fRootOpening(const std::string& theRootTag)
{
    if (theRootTag.find("HEADER_INFO") == std::string::npos) return "<" + theRootTag + ">";
    const std::string aFormat = std::string("%s xmlns=\"") + CQORV_XML_NAMESPACE + "\"\n\txmlns:xsi=\"" +
                                CQORV_XML_INSTANCE_NAMESPACE + "\"\n\txsi:schemaLocation=\"" + CQORV_XML_NAMESPACE +
                                "\n\t" + CQORV_XML_NAMESPACE + "/%s\"";
    std::string aText(aFormat.size() + theRootTag.size() + 64, '\0');
    const int aLen = std::snprintf(aText.data(), aText.size(), aFormat.c_str(), theRootTag.c_str(), CQORV_XML_SCHEMA_FILE);
    aText.resize(static_cast<std::size_t>(aLen > 0 ? aLen : 0));
    return "<" + aText + ">";
}

std::string_view fTrimLeft(std::string_view theText)
{
    while (!theText.empty() && fIsBlank(theText.front())) theText.remove_prefix(1);
    return theText;
}

/// Whether a line (trimmed on the left) opens the element theName: "<Name>" or "<Name ...".
bool fOpensElement(std::string_view theLine, const std::string& theName)
{
    theLine = fTrimLeft(theLine);
    if (theLine.size() < theName.size() + 2 || theLine[0] != '<') return false;
    if (theLine.compare(1, theName.size(), theName) != 0) return false;
    const char aNext = theLine[theName.size() + 1];
    return aNext == '>' || aNext == ' ' || aNext == '\t' || aNext == '/';
}

bool fClosesElement(std::string_view theLine, const std::string& theName)
{
    theLine = fTrimLeft(theLine);
    return theLine.size() >= theName.size() + 3 && theLine.compare(0, 2, "</") == 0 &&
           theLine.compare(2, theName.size(), theName) == 0 && theLine[theName.size() + 2] == '>';
}

/// Writes the sections into an existing file's text: each replaces the lines from its opening to
/// its closing tag; a section the file lacks goes before the root's closing tag.
/// The line of the root's closing tag (the last closing tag of the file), or -1.
int fRootClosingLine(const std::vector<std::string>& theLines)
{
    for (int i = static_cast<int>(theLines.size()) - 1; i > 0; --i)
        if (fTrimLeft(theLines[static_cast<std::size_t>(i)]).substr(0, 2) == "</") return i;
    return -1;
}

bool fWriteUpdated(FILE* theFile, const std::vector<std::string>& theOldLines,
                   const std::vector<const CDescriptionSection*>& theSections)
{
    const int aRootClose = fRootClosingLine(theOldLines);
    struct CRange {
        int mOpen, mClose;
        const CDescriptionSection* mSection;
    };
    std::vector<CRange> aReplaced;
    std::vector<const CDescriptionSection*> aAppended;
    for (const CDescriptionSection* aSection : theSections) {
        int aOpen = -1, aClose = -1;
        for (int i = 1; i < aRootClose && aOpen < 0; ++i)
            if (fOpensElement(theOldLines[static_cast<std::size_t>(i)], aSection->mName)) aOpen = i;
        for (int i = aOpen + 1; aOpen >= 0 && i < aRootClose && aClose < 0; ++i)
            if (fClosesElement(theOldLines[static_cast<std::size_t>(i)], aSection->mName)) aClose = i;
        if (aOpen >= 0 && aClose >= 0) aReplaced.push_back({aOpen, aClose, aSection});
        else aAppended.push_back(aSection);
    }
    std::sort(aReplaced.begin(), aReplaced.end(), [](const CRange& a, const CRange& b) { return a.mOpen < b.mOpen; });
    CXmlSink aSink(theFile);
    std::size_t aNext = 0;
    for (int i = 0; i < static_cast<int>(theOldLines.size()); ++i) {
        while (aNext < aReplaced.size() && aReplaced[aNext].mOpen < i) ++aNext;  // overlapping ranges: the first wins
        if (aNext < aReplaced.size() && aReplaced[aNext].mOpen == i) {
            fWriteSection(aSink, *aReplaced[aNext].mSection);
            i = aReplaced[aNext].mClose;
            ++aNext;
            continue;
        }
        if (i == aRootClose)
            for (const CDescriptionSection* aSection : aAppended) fWriteSection(aSink, *aSection);
        aSink.line(0, theOldLines[static_cast<std::size_t>(i)]);
    }
    return aSink.flush();
}

/// Whether a written header file parses and holds its root element (theContext: the root tag).
bool fReadsBack(const std::string& theTemporary, const void* theContext)
{
    const auto aTree = fqorv_xml_parser(CQORV_XML_MAX_NODES_READ, CQORV_XML_MAX_DEPTH, theTemporary.c_str(),
                                        static_cast<int>(CQORV_POOL_BUFFER_SIZE));
    const std::string& aRootTag = *static_cast<const std::string*>(theContext);
    if (aTree && aTree->find(aRootTag.c_str(), 0, static_cast<int>(aTree->mNodes.size())) >= 0) return true;
    fdfTrace("The written header %s does not read back: it does not replace the old one\n", theTemporary.c_str());
    return false;
}

}  // namespace

bool CDescriptionHeader::writeXML(const char* thePath, bool theNewFile, bool theMandatory)
{
    const std::string aPath = thePath ? thePath : "";
    if (getSection("RasterInfo") && findField("RasterInfo.OtherInfo")) {
        const char* aVersion = gVersionText.empty() ? CQORV_VERSION_TEXT : gVersionText.c_str();
        fqorvSetUserKey(*this, "SOFTWARE", aVersion);
    }
    std::vector<const CDescriptionSection*> aSections;
    for (const auto& aSection : mSections)
        if (aSection->hasInitialisedField()) aSections.push_back(aSection.get());

    // An existing file without a recognisable root is written anew.
    std::vector<std::string> aOldLines;
    const bool aUpdate = !theNewFile && fqorvFileExists(aPath) && fqorvReadAllLines(aPath, aOldLines) &&
                         fRootClosingLine(aOldLines) > 0;
    // A header is replaced only by a file that reads back.
    const bool aOk = !aPath.empty() && fqorvWriteAtomically(aPath, [&](FILE* theFile) {
        if (aUpdate) return fWriteUpdated(theFile, aOldLines, aSections);
        CXmlSink aSink(theFile);
        aSink.line(0, "<?xml version=\"1.0\" ?>");
        aSink.line(0, fRootOpening(mRootTag));
        for (const CDescriptionSection* aSection : aSections) fWriteSection(aSink, *aSection);
        aSink.line(0, "</" + mRootTag + ">");
        return aSink.flush();
    }, fReadsBack, &mRootTag);
    if (!aOk) {
        fdfTrace("Error while writing the header file %s\n", aPath.c_str());
        if (theMandatory) QORV_FATAL(CQORV_ERR_WRITE_FILE, aPath.c_str());
    }
    return aOk;
}

// ------------------------------------------------------------------------------------------------
// The reader

namespace {

[[noreturn]] void fBadValue(const CDescriptionField& theField)
{
    fdfTrace("Data Type ID : %d\n", theField.mDataType);
    theField.print(true);
    QORV_FATAL(CQORV_ERR_FIELD_TYPE, theField.name());
}

/// Sets element (row, col) of a field from a node's text.
void fSetFromNode(const CQorvXmlTree& theTree, int theNode, CDescriptionField& theField, int theRow, int theCol)
{
    const CQorvXmlNode& aNode = theTree.mNodes[static_cast<std::size_t>(theNode)];
    if (aNode.mEnd != theNode + 1) fBadValue(theField);  // an element where a value was expected
    switch (theField.mDataType) {
    case CQORV_DT_INTEGER: {
        int aValue = 0;
        if (!fqorvParseInteger(aNode.mText, aValue)) fBadValue(theField);
        theField.setValue(theRow, theCol, aValue);
        break;
    }
    case CQORV_DT_DOUBLE: {
        double aValue = 0.0;
        if (!fqorvParseDouble(aNode.mText, aValue)) fBadValue(theField);
        theField.setValue(theRow, theCol, aValue);
        break;
    }
    case CQORV_DT_STRING: theField.setValue(theRow, theCol, fqorvXmlUnescape(aNode.mText).c_str()); break;
    default: fBadValue(theField);
    }
}

/// Elements nested in a node: the most values that a count attribute of that node can describe.
long long fNodesInside(const CQorvXmlTree& theTree, int theNode)
{
    return static_cast<long long>(theTree.mNodes[static_cast<std::size_t>(theNode)].mEnd) - theNode - 1;
}

/// A count attribute of a wrapper element; a missing or wrong one is a wrongly built field, and so is
/// a count above the elements the wrapper holds (the storage is sized from what the file holds).
int fCountAttribute(const CQorvXmlTree& theTree, int theNode, const char* theName, const CDescriptionField& theField)
{
    const char* aText = theTree.attribute(theNode, theName);
    int aValue = 0;
    if (!aText || !fqorvParseInteger(aText, aValue) || aValue < 0) fBadValue(theField);
    if (aValue > fNodesInside(theTree, theNode)) {
        fdfTrace("%s = %d but the element holds %lld\n", theName, aValue, fNodesInside(theTree, theNode));
        fBadValue(theField);
    }
    return aValue;
}

/// The first child element of a field's node (its wrapper), or a failure.
int fWrapper(const CQorvXmlTree& theTree, int theNode, const CDescriptionField& theField)
{
    if (theTree.mNodes[static_cast<std::size_t>(theNode)].mEnd <= theNode + 1) fBadValue(theField);
    return theNode + 1;
}

void fReadVector(const CQorvXmlTree& theTree, int theNode, CDescriptionField& theField)
{
    const int aWrapper = fWrapper(theTree, theNode, theField);
    const int aCount = fCountAttribute(theTree, aWrapper, "NumberOfElements", theField);
    theField.resize(1, aCount);
    int k = 0;
    const int aEnd = theTree.mNodes[static_cast<std::size_t>(aWrapper)].mEnd;
    for (int i = aWrapper + 1; i < aEnd && k < aCount; i = theTree.mNodes[static_cast<std::size_t>(i)].mEnd, ++k)
        fSetFromNode(theTree, i, theField, 0, k);
}

void fReadMatrix(const CQorvXmlTree& theTree, int theNode, CDescriptionField& theField)
{
    const int aWrapper = fWrapper(theTree, theNode, theField);
    const int aRows = fCountAttribute(theTree, aWrapper, "NumberOfRows", theField);
    const int aCols = fCountAttribute(theTree, aWrapper, "NumberOfColumns", theField);
    if (static_cast<long long>(aRows) * aCols > fNodesInside(theTree, aWrapper)) fBadValue(theField);
    theField.resize(aRows, aCols);
    int r = 0;
    const int aEnd = theTree.mNodes[static_cast<std::size_t>(aWrapper)].mEnd;
    for (int i = aWrapper + 1; i < aEnd && r < aRows; i = theTree.mNodes[static_cast<std::size_t>(i)].mEnd) {
        const CQorvXmlNode& aRow = theTree.mNodes[static_cast<std::size_t>(i)];
        if (aRow.mName.compare(0, 9, "MatrixRow") != 0) continue;
        int c = 0;
        for (int j = i + 1; j < aRow.mEnd && c < aCols; j = theTree.mNodes[static_cast<std::size_t>(j)].mEnd, ++c)
            fSetFromNode(theTree, j, theField, r, c);
        ++r;
    }
}

CDescriptionField* fSubFieldByName(const CDescriptionField& theField, const std::string& theName)
{
    for (CDescriptionField* aSub : theField.mSubFields)
        if (aSub && aSub->mName == theName) return aSub;
    return nullptr;
}

void fReadMultiple(const CQorvXmlTree& theTree, int theNode, CDescriptionField& theField)
{
    const int aWrapper = fWrapper(theTree, theNode, theField);
    const CQorvXmlNode& aOuter = theTree.mNodes[static_cast<std::size_t>(aWrapper)];
    const bool aVectors = !theField.mSubFields.empty() && theField.mSubFields[0] &&
                          theField.mSubFields[0]->mStructure == CQORV_DS_VECTOR;
    const int aFields = fCountAttribute(theTree, aWrapper, "NumberOfFields", theField);
    if (aFields != static_cast<int>(theField.mSubFields.size())) fdfTrace("MULTIPLE Found Fields : %d\n", aFields);
    if (aOuter.mName == "VectorOfStructs_" + theField.mName) {
        if (!aVectors) fBadValue(theField);
        const int aCount = fCountAttribute(theTree, aWrapper, "NumberOfElements", theField);
        theField.resize(1, aCount);
        const std::string aInnerName = "VectorOfStructsValues_" + theField.mName;
        int k = 0;
        for (int i = aWrapper + 1; i < aOuter.mEnd && k < aCount; i = theTree.mNodes[static_cast<std::size_t>(i)].mEnd) {
            const CQorvXmlNode& aInner = theTree.mNodes[static_cast<std::size_t>(i)];
            if (aInner.mName != aInnerName) continue;
            for (int j = i + 1; j < aInner.mEnd; j = theTree.mNodes[static_cast<std::size_t>(j)].mEnd)
                if (CDescriptionField* aSub = fSubFieldByName(theField, theTree.mNodes[static_cast<std::size_t>(j)].mName))
                    fSetFromNode(theTree, j, *aSub, 0, k);
            ++k;
        }
    } else if (aOuter.mName == "Struct_" + theField.mName) {
        if (aVectors) fBadValue(theField);
        for (int j = aWrapper + 1; j < aOuter.mEnd; j = theTree.mNodes[static_cast<std::size_t>(j)].mEnd)
            if (CDescriptionField* aSub = fSubFieldByName(theField, theTree.mNodes[static_cast<std::size_t>(j)].mName))
                fSetFromNode(theTree, j, *aSub, 0, 0);
    } else {
        fBadValue(theField);
    }
}

void fReadField(const CQorvXmlTree& theTree, int theNode, CDescriptionField& theField)
{
    switch (theField.mStructure) {
    case CQORV_DS_SCALAR: {
        const CQorvXmlNode& aNode = theTree.mNodes[static_cast<std::size_t>(theNode)];
        if (theField.mDataType == CQORV_DT_STRING && !aNode.mHasText && aNode.mEnd == theNode + 1)
            theField.setValue("");  // an empty element is an empty text
        else
            fSetFromNode(theTree, theNode, theField, 0, 0);
        break;
    }
    case CQORV_DS_VECTOR: fReadVector(theTree, theNode, theField); break;
    case CQORV_DS_MATRIX: fReadMatrix(theTree, theNode, theField); break;
    case CQORV_DS_MULTIPLE: fReadMultiple(theTree, theNode, theField); break;
    default: fBadValue(theField);
    }
}

/// Index in theNodes of the node named theName, searched among all of them, starting at theHint
/// and wrapping around; theHint moves behind the node found.
int fFindNamed(const CQorvXmlTree& theTree, const std::vector<int>& theNodes, const std::string& theName,
               std::size_t& theHint)
{
    const std::size_t aCount = theNodes.size();
    for (std::size_t k = 0; k < aCount; ++k) {
        const std::size_t aPos = (theHint + k) % aCount;
        if (theTree.mNodes[static_cast<std::size_t>(theNodes[aPos])].mName == theName) {
            theHint = aPos + 1;
            return theNodes[aPos];
        }
    }
    return -1;
}

/// Reads the fields of a section from its node: each field is looked for among all the nodes of the
/// section, whatever their order; the walk from the last position found makes key-file order fast.
void fReadSection(const CQorvXmlTree& theTree, int theSectionNode, CDescriptionSection& theSection)
{
    const std::vector<int> aChildren = theTree.children(theSectionNode);
    std::size_t aHint = 0;
    for (const auto& aField : theSection.mFields) {
        if (aField->mParentIndex != -1) continue;
        const int aNode = fFindNamed(theTree, aChildren, aField->mName, aHint);
        if (aNode >= 0) fReadField(theTree, aNode, *aField);
    }
}

bool fLooksLikeXml(const std::string& thePath)
{
    FILE* aFile = std::fopen(thePath.c_str(), "rb");
    if (!aFile) return false;
    CStdioFile aCloser(aFile);
    int c;
    while ((c = std::fgetc(aFile)) != EOF)
        if (!fIsBlank(static_cast<char>(c))) return c == '<';
    return false;
}

std::string fBaseName(const char* thePath)
{
    return fqorvCutSuffix(fqorvCutSuffix(thePath ? thePath : "", "_hdr"), ".sml");
}

}  // namespace

bool CDescriptionHeader::readXML(const char* thePath, bool theMandatory)
{
    const std::string aPath = thePath ? thePath : "";
    auto aTree = fqorv_xml_parser(CQORV_XML_MAX_NODES_READ, CQORV_XML_MAX_DEPTH, aPath.c_str(),
                                  static_cast<int>(CQORV_POOL_BUFFER_SIZE));
    if (!aTree) {
        if (theMandatory) QORV_FATAL(CQORV_ERR_RASTER_ACCESS, aPath.c_str());
        return false;
    }
    reset();
    int aRoot = -1;
    for (std::size_t i = 0; i < aTree->mNodes.size() && aRoot < 0; ++i)
        if (aTree->mNodes[i].mName == mRootTag) aRoot = static_cast<int>(i);
    if (aRoot < 0) {
        fdfTrace("NOT FOUND this->mInitialTag : %s\n", mRootTag.c_str());
        return false;
    }
    const std::vector<int> aSectionNodes = aTree->children(aRoot);
    std::size_t aHint = 0;
    for (const auto& aSection : mSections) {
        const int aNode = fFindNamed(*aTree, aSectionNodes, aSection->mName, aHint);
        if (aNode >= 0) fReadSection(*aTree, aNode, *aSection);
    }
    return true;
}

bool CDescriptionHeader::readFromXMLFile(const char* thePath, CDescriptionSection& theSection)
{
    auto aTree = fqorv_xml_parser(CQORV_XML_MAX_NODES_SECTION, CQORV_XML_MAX_DEPTH, thePath,
                                  static_cast<int>(CQORV_POOL_BUFFER_SIZE));
    if (!aTree) return false;
    theSection.reset();
    const int aNode = aTree->find(theSection.mName.c_str(), 0, static_cast<int>(aTree->mNodes.size()));
    if (aNode < 0) {
        fdfTrace("NOT FOUND section %s in %s\n", theSection.name(), thePath);
        return false;
    }
    fReadSection(*aTree, aNode, theSection);
    return true;
}

bool CDescriptionHeader::read(const char* thePath, bool theMandatory)
{
    const std::string aPath = thePath ? thePath : "";
    const std::string aName = fBaseName(aPath.c_str());
    if (fqorvFileExists(aName + ".sml")) return readXML((aName + ".sml").c_str(), theMandatory);
    std::string aFile;
    if (fqorvFileExists(aName + "_hdr")) aFile = aName + "_hdr";
    else if (fqorvFileExists(aPath)) aFile = aPath;
    if (aFile.empty()) {
        fdfTrace("Not Found\n");
        fdfTrace("\nFile : %s Not Found\n\n", aPath.c_str());
        return false;
    }
    if (fLooksLikeXml(aFile)) return readXML(aFile.c_str(), theMandatory);
    return readText(aFile.c_str(), theMandatory);
}

// ------------------------------------------------------------------------------------------------
// write: directory, DEM coordinates, XML, text form, ENVI header

namespace {

void fMakeDirectory(const std::string& thePath)
{
    namespace fs = std::filesystem;
    const fs::path aDir = fs::path(thePath).parent_path();
    std::error_code aError;
    if (aDir.empty() || fs::is_directory(aDir, aError)) return;
    fs::path aPart;
    for (const fs::path& aElement : aDir) {
        aPart /= aElement;
        if (fs::is_directory(aPart, aError)) continue;
        if (!fs::create_directory(aPart, aError) && aError) {
            fdfTrace("Cannot create the dir = %s\n", aDir.c_str());
            fdfTrace("Cannot create the part = %s\n", aPart.c_str());
            fdfTrace("Error Code = %d\n", aError.value());
            return;
        }
    }
}

bool fHolds(const CDescriptionHeader& theHeader, const char* theKey, int theType)
{
    const CDescriptionField* aField = theHeader.findField(theKey);
    return aField && aField->mStructure == CQORV_DS_SCALAR && aField->mDataType == theType && aField->isInitialised();
}

/// A geocoded image's DEM grid follows from its corner, spacing and size (northing decreasing).
void fDeriveDemCoordinates(CDescriptionHeader& theHeader)
{
    if (!theHeader.getSection("RasterInfo") || !theHeader.getSection("RegistrationCoordinates") ||
        !theHeader.getSection("DEMCoordinates"))
        return;
    if (!fHolds(theHeader, "RasterInfo.GeocodedImage", CQORV_DT_STRING) ||
        std::strcmp(theHeader["RasterInfo.GeocodedImage"].getString(), "OK") != 0)
        return;
    const char* aDoubles[] = {"RegistrationCoordinates.PixelSpacingLatNorth", "RegistrationCoordinates.PixelSpacingLonEast",
                              "RegistrationCoordinates.LatNorthing", "RegistrationCoordinates.LonEasting"};
    for (const char* aKey : aDoubles)
        if (!fHolds(theHeader, aKey, CQORV_DT_DOUBLE)) return;
    if (!fHolds(theHeader, "RasterInfo.NrOfLinesPerImage", CQORV_DT_INTEGER) ||
        !fHolds(theHeader, "RasterInfo.NrOfPixelsPerLine", CQORV_DT_INTEGER))
        return;
    const double aLat = theHeader["RegistrationCoordinates.LatNorthing"].getDouble();
    const double aLon = theHeader["RegistrationCoordinates.LonEasting"].getDouble();
    const double aDLat = theHeader["RegistrationCoordinates.PixelSpacingLatNorth"].getDouble();
    const double aDLon = theHeader["RegistrationCoordinates.PixelSpacingLonEast"].getDouble();
    const int aLines = theHeader["RasterInfo.NrOfLinesPerImage"].getInteger();
    const int aPixels = theHeader["RasterInfo.NrOfPixelsPerLine"].getInteger();
    theHeader["DEMCoordinates.NorthingCoordinateBegin"].setValue(aLat);
    theHeader["DEMCoordinates.NorthingGridSize"].setValue(-aDLat);
    theHeader["DEMCoordinates.NorthingCoordinateEnd"].setValue(aLat - aDLat * (aLines - 1));
    theHeader["DEMCoordinates.EastingCoordinateBegin"].setValue(aLon);
    theHeader["DEMCoordinates.EastingGridSize"].setValue(aDLon);
    theHeader["DEMCoordinates.EastingCoordinateEnd"].setValue(aLon + aDLon * (aPixels - 1));
}

}  // namespace

bool CDescriptionHeader::write(const char* thePath, bool theMandatory, bool theAlsoText)
{
    const std::string aPath = thePath ? thePath : "";
    fMakeDirectory(aPath);
    fDeriveDemCoordinates(*this);
    const std::string aXmlPath = fBaseName(aPath.c_str()) + ".sml";
    const bool aOk = writeXML(aXmlPath.c_str(), true, theMandatory);
    if (theAlsoText) {
        const std::string aTextPath = fqorvEndsWith(aPath, ".sml") ? fqorvCutSuffix(aPath, ".sml") : aPath;
        writeText(aTextPath.c_str(), theMandatory);
    }
    if (gEnviHeaderWriter) gEnviHeaderWriter(aPath.c_str());
    return aOk;
}

// Header files in XML: the node tree of the expat-based parser, value texts, and the format's names.
//
// A ".sml" file is one XML document: the root element (normally "HEADER_INFO"), one element per
// section, one element per field; vectors, matrices and MULTIPLE fields have wrapper elements of
// their own. The writer and the reader are members of CDescriptionHeader (qorv_description_section.h).
#pragma once

#include <memory>
#include <string>
#include <string_view>
#include <vector>

/// The schema's namespace and file, named in the root tag of "HEADER_INFO" headers (never read).
inline constexpr const char* CQORV_XML_NAMESPACE = "http://www.qorvex.org/xml/QorvexHeaderSchema";
inline constexpr const char* CQORV_XML_INSTANCE_NAMESPACE = "http://www.w3.org/2001/XMLSchema-instance";
inline constexpr const char* CQORV_XML_SCHEMA_FILE = "QorvexHeaderSchema_version_1.0.xsd";
/// Node limits of the readers.
inline constexpr int CQORV_XML_MAX_NODES_READ = 10000000;
inline constexpr int CQORV_XML_MAX_NODES_SECTION = 50000;
inline constexpr int CQORV_XML_MAX_DEPTH = 64;
/// Significant digits of a double in a header file.
inline constexpr int CQORV_XML_DOUBLE_DIGITS = 30;

/// One element of a parsed file. Nodes stand in a flat array in document order; a node's subtree
/// is the index range (own index, mEnd).
struct CQorvXmlNode {
    int mDepth = 0;
    int mEnd = 0;           // index after the last node of this node's subtree
    std::string mName;
    std::string mText;      // the element's text, leading blanks and tabs dropped, as the parser saw it
    bool mHasText = false;
    int mAttrBegin = 0;     // first attribute in CQorvXmlTree::mAttributes
    int mAttrCount = 0;
};

struct CQorvXmlAttribute {
    std::string mName;
    std::string mValue;
};

/// The result of fqorv_xml_parser.
class CQorvXmlTree {
public:
    std::vector<CQorvXmlNode> mNodes;
    std::vector<CQorvXmlAttribute> mAttributes;

    /// The value of a node's attribute, or null.
    const char* attribute(int theNode, const char* theName) const;
    /// The first node named theName at index theFrom or after, inside [theFrom, theEnd), or -1.
    int find(const char* theName, int theFrom, int theEnd) const;
    /// The direct children of a node, in document order.
    std::vector<int> children(int theNode) const;
};

/// Parses an XML file through the pre-pass (entities and high bytes rewritten line by line, lines
/// read with theLineLength). Returns null when the file can't be opened or parsed, or holds more
/// than theMaxNodes elements or deeper nesting than theMaxDepth; the trace tells why.
std::unique_ptr<CQorvXmlTree> fqorv_xml_parser(int theMaxNodes, int theMaxDepth, const char* thePath, int theLineLength);

/// The pre-pass on one line: "&quot;" "&apos;" "&amp;" "&lt;" "&gt;" become "##quot" ... "##gt",
/// a byte 0x80-0xA4 becomes "####BIG" and that byte plus 0xB0, and the bytes 0xE9 0xF1 0xFC 0xF6
/// 0xB0 become "e" "n" "u" "o" "d". Returns false (and leaves theOut alone) when nothing changes.
bool fqorvXmlPrepass(std::string_view theLine, std::string& theOut);
/// The reverse pass on a string value: "##quot" ... "##gt" back to their characters and
/// "####BIG" with its byte back to the original byte.
std::string fqorvXmlUnescape(std::string_view theText);
/// A text with & < > " ' written as entities.
std::string fqorvXmlEscape(std::string_view theText);

/// A double as the header files write it: 30 significant digits in the general format
/// (as printf "%.30g"), "NaN" for not-a-number.
std::string fqorvFormatDouble(double theValue);
/// Appends the same text to theOut.
void fqorvAppendDouble(std::string& theOut, double theValue);

/// Conversions of value texts: blanks around the text are ignored; a double also takes "NaN".
bool fqorvParseInteger(std::string_view theText, int& theValue);
bool fqorvParseDouble(std::string_view theText, double& theValue);

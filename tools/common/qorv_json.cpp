#include "qorv_json.h"

#include <cmath>
#include <cstdio>
#include <cstdlib>
#include <fstream>
#include <sstream>

namespace {

/// Arrays and objects nest at most this deep: the parser recurses once per level.
constexpr int CJSON_MAX_DEPTH = 200;

class Parser {
public:
    explicit Parser(const std::string& t) : s(t) {}

    CJson value()
    {
        ws();
        if (p >= s.size()) fail("unexpected end");
        const char c = s[p];
        if (c == '{' || c == '[') {
            if (depth >= CJSON_MAX_DEPTH) fail("nesting deeper than 200 levels");
            ++depth;
            CJson v = c == '{' ? object() : array();
            --depth;
            return v;
        }
        if (c == '"') return CJson(str());
        if (c == 't') { word("true"); return CJson(true); }
        if (c == 'f') { word("false"); return CJson(false); }
        if (c == 'n') { word("null"); return CJson(); }
        if (c == 'N') { word("NaN"); return CJson(std::nan("")); }
        return CJson(num());
    }
    void end()
    {
        ws();
        if (p != s.size()) fail("trailing characters");
    }

private:
    [[noreturn]] void fail(const char* what) const
    {
        throw std::runtime_error(std::string("JSON: ") + what + " at offset " + std::to_string(p));
    }
    void ws()
    {
        while (p < s.size() && (s[p] == ' ' || s[p] == '\n' || s[p] == '\r' || s[p] == '\t')) ++p;
    }
    static int hexDigit(char c)
    {
        if (c >= '0' && c <= '9') return c - '0';
        if (c >= 'a' && c <= 'f') return c - 'a' + 10;
        if (c >= 'A' && c <= 'F') return c - 'A' + 10;
        return -1;
    }
    void word(const char* w)
    {
        for (const char* q = w; *q; ++q, ++p)
            if (p >= s.size() || s[p] != *q) fail("bad literal");
    }
    double num()
    {
        const char* b = s.c_str() + p;
        char* e = nullptr;
        const double d = std::strtod(b, &e);
        if (e == b) fail("bad number");
        p += static_cast<std::size_t>(e - b);
        return d;
    }
    std::string str()
    {
        std::string out;
        ++p;
        while (true) {
            if (p >= s.size()) fail("unterminated string");
            const char c = s[p++];
            if (c == '"') break;
            if (c != '\\') { out += c; continue; }
            if (p >= s.size()) fail("bad escape");
            const char e = s[p++];
            switch (e) {
            case 'n': out += '\n'; break;
            case 't': out += '\t'; break;
            case 'r': out += '\r'; break;
            case 'b': out += '\b'; break;
            case 'f': out += '\f'; break;
            case 'u': {
                unsigned cp = 0;
                for (int k = 0; k < 4; ++k, ++p) {
                    const int h = p < s.size() ? hexDigit(s[p]) : -1;
                    if (h < 0) fail("bad unicode escape");
                    cp = cp * 16 + static_cast<unsigned>(h);
                }
                if (cp < 0x80) out += static_cast<char>(cp);
                else if (cp < 0x800) { out += static_cast<char>(0xC0 | (cp >> 6)); out += static_cast<char>(0x80 | (cp & 0x3F)); }
                else { out += static_cast<char>(0xE0 | (cp >> 12)); out += static_cast<char>(0x80 | ((cp >> 6) & 0x3F)); out += static_cast<char>(0x80 | (cp & 0x3F)); }
                break;
            }
            default: out += e;
            }
        }
        return out;
    }
    CJson array()
    {
        CJson a = CJson::array();
        ++p;
        ws();
        if (p < s.size() && s[p] == ']') { ++p; return a; }
        while (true) {
            a.push(value());
            ws();
            if (p >= s.size()) fail("unterminated array");
            if (s[p] == ',') { ++p; continue; }
            if (s[p] == ']') { ++p; return a; }
            fail("expected , or ]");
        }
    }
    CJson object()
    {
        CJson o = CJson::object();
        ++p;
        ws();
        if (p < s.size() && s[p] == '}') { ++p; return o; }
        while (true) {
            ws();
            if (p >= s.size() || s[p] != '"') fail("expected key");
            std::string k = str();
            ws();
            if (p >= s.size() || s[p] != ':') fail("expected :");
            ++p;
            o[k] = value();
            ws();
            if (p >= s.size()) fail("unterminated object");
            if (s[p] == ',') { ++p; continue; }
            if (s[p] == '}') { ++p; return o; }
            fail("expected , or }");
        }
    }

    const std::string& s;
    std::size_t p = 0;
    int depth = 0;
};

void escape(std::string& out, const std::string& v)
{
    out += '"';
    for (const char c : v) {
        switch (c) {
        case '"': out += "\\\""; break;
        case '\\': out += "\\\\"; break;
        case '\n': out += "\\n"; break;
        case '\t': out += "\\t"; break;
        case '\r': out += "\\r"; break;
        default:
            if (static_cast<unsigned char>(c) < 0x20) {
                char b[8];
                std::snprintf(b, sizeof b, "\\u%04x", c);
                out += b;
            } else {
                out += c;
            }
        }
    }
    out += '"';
}

}  // namespace

CJson::CJson(const std::vector<double>& v) : mKind(Kind::Array)
{
    for (const double d : v) mElements.emplace_back(d);
}

CJson CJson::parse(const std::string& theText)
{
    Parser p(theText);
    CJson v = p.value();
    p.end();
    return v;
}

CJson CJson::parseFile(const std::string& thePath)
{
    std::ifstream in(thePath, std::ios::binary);
    if (!in) throw std::runtime_error("JSON: cannot open " + thePath);
    std::stringstream ss;
    ss << in.rdbuf();
    return parse(ss.str());
}

std::string CJson::dump(int theIndent) const
{
    std::string out;
    dumpTo(out, theIndent, 0);
    return out;
}

void CJson::dumpFile(const std::string& thePath, int theIndent) const
{
    const std::string aTmp = thePath + ".tmp";
    {
        std::ofstream out(aTmp, std::ios::binary | std::ios::trunc);
        if (!out) throw std::runtime_error("JSON: cannot write " + thePath);
        out << dump(theIndent) << '\n';
        if (!out) throw std::runtime_error("JSON: cannot write " + thePath);
    }
    if (std::rename(aTmp.c_str(), thePath.c_str()) != 0) throw std::runtime_error("JSON: cannot rename to " + thePath);
}

void CJson::dumpTo(std::string& out, int indent, int level) const
{
    const auto newline = [&](int l) {
        if (indent <= 0) return;
        out += '\n';
        out.append(static_cast<std::size_t>(indent * l), ' ');
    };
    switch (mKind) {
    case Kind::Null: out += "null"; break;
    case Kind::Bool: out += mBool ? "true" : "false"; break;
    case Kind::Number: {
        if (!std::isfinite(mNumber)) { out += "null"; break; }
        char b[40];
        if (mNumber == std::floor(mNumber) && std::fabs(mNumber) < 1e15)
            std::snprintf(b, sizeof b, "%.0f", mNumber);
        else
            std::snprintf(b, sizeof b, "%.17g", mNumber);
        out += b;
        break;
    }
    case Kind::String: escape(out, mString); break;
    case Kind::Array:
        out += '[';
        for (std::size_t i = 0; i < mElements.size(); ++i) {
            if (i) out += ',';
            newline(level + 1);
            mElements[i].dumpTo(out, indent, level + 1);
        }
        if (!mElements.empty()) newline(level);
        out += ']';
        break;
    case Kind::Object:
        out += '{';
        for (std::size_t i = 0; i < mMembers.size(); ++i) {
            if (i) out += ',';
            newline(level + 1);
            escape(out, mMembers[i].first);
            out += indent > 0 ? ": " : ":";
            mMembers[i].second.dumpTo(out, indent, level + 1);
        }
        if (!mMembers.empty()) newline(level);
        out += '}';
        break;
    }
}

double CJson::number() const
{
    if (mKind == Kind::Null) return std::nan("");
    if (mKind != Kind::Number) throw std::runtime_error("JSON: not a number");
    return mNumber;
}

bool CJson::boolean() const
{
    if (mKind != Kind::Bool) throw std::runtime_error("JSON: not a boolean");
    return mBool;
}

const std::string& CJson::string() const
{
    if (mKind != Kind::String) throw std::runtime_error("JSON: not a string");
    return mString;
}

std::size_t CJson::size() const
{
    return mKind == Kind::Array ? mElements.size() : mKind == Kind::Object ? mMembers.size() : 0;
}

const CJson& CJson::operator[](std::size_t i) const
{
    if (mKind != Kind::Array || i >= mElements.size()) throw std::runtime_error("JSON: index out of range");
    return mElements[i];
}

CJson& CJson::push(CJson theValue)
{
    if (mKind == Kind::Null) mKind = Kind::Array;
    if (mKind != Kind::Array) throw std::runtime_error("JSON: push on a non-array");
    mElements.push_back(std::move(theValue));
    return mElements.back();
}

const CJson& CJson::operator[](const std::string& theKey) const
{
    if (mKind == Kind::Object)
        for (const auto& m : mMembers)
            if (m.first == theKey) return m.second;
    throw std::runtime_error("JSON: missing key " + theKey);
}

CJson& CJson::operator[](const std::string& theKey)
{
    if (mKind == Kind::Null) mKind = Kind::Object;
    if (mKind != Kind::Object) throw std::runtime_error("JSON: member of a non-object");
    for (auto& m : mMembers)
        if (m.first == theKey) return m.second;
    mMembers.emplace_back(theKey, CJson());
    return mMembers.back().second;
}

bool CJson::has(const std::string& theKey) const
{
    if (mKind != Kind::Object) return false;
    for (const auto& m : mMembers)
        if (m.first == theKey) return true;
    return false;
}

std::vector<double> CJson::numbers() const
{
    std::vector<double> v;
    for (const auto& e : elements()) v.push_back(e.number());
    return v;
}

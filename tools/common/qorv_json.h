// A small JSON value with a parser and a writer, for the truth and report files of the tools.
// Objects keep the order in which keys were inserted.
#pragma once

#include <map>
#include <memory>
#include <stdexcept>
#include <string>
#include <utility>
#include <vector>

class CJson {
public:
    enum class Kind { Null, Bool, Number, String, Array, Object };

    CJson() = default;
    CJson(std::nullptr_t) {}
    CJson(bool b) : mKind(Kind::Bool), mBool(b) {}
    CJson(double d) : mKind(Kind::Number), mNumber(d) {}
    CJson(int i) : mKind(Kind::Number), mNumber(i) {}
    CJson(long i) : mKind(Kind::Number), mNumber(static_cast<double>(i)) {}
    CJson(long long i) : mKind(Kind::Number), mNumber(static_cast<double>(i)) {}
    CJson(const char* s) : mKind(Kind::String), mString(s) {}
    CJson(std::string s) : mKind(Kind::String), mString(std::move(s)) {}
    CJson(const std::vector<double>& v);

    static CJson array() { CJson j; j.mKind = Kind::Array; return j; }
    static CJson object() { CJson j; j.mKind = Kind::Object; return j; }

    /// Parses a JSON text; throws std::runtime_error with the position on a syntax error.
    static CJson parse(const std::string& theText);
    static CJson parseFile(const std::string& thePath);

    /// Writes the value; indent 0 gives one line. Numbers keep 17 significant digits.
    std::string dump(int theIndent = 2) const;
    void dumpFile(const std::string& thePath, int theIndent = 2) const;

    Kind kind() const { return mKind; }
    bool isNull() const { return mKind == Kind::Null; }
    bool isNumber() const { return mKind == Kind::Number; }
    bool isString() const { return mKind == Kind::String; }
    bool isArray() const { return mKind == Kind::Array; }
    bool isObject() const { return mKind == Kind::Object; }

    double number() const;
    bool boolean() const;
    const std::string& string() const;
    std::size_t size() const;

    /// Array element; throws when out of range or not an array.
    const CJson& operator[](std::size_t i) const;
    CJson& push(CJson theValue);
    /// Object member; the const form throws for a missing key, the other inserts null.
    const CJson& operator[](const std::string& theKey) const;
    CJson& operator[](const std::string& theKey);
    const CJson& operator[](const char* theKey) const { return (*this)[std::string(theKey)]; }
    CJson& operator[](const char* theKey) { return (*this)[std::string(theKey)]; }
    bool has(const std::string& theKey) const;
    const std::vector<std::pair<std::string, CJson>>& members() const { return mMembers; }
    const std::vector<CJson>& elements() const { return mElements; }

    std::vector<double> numbers() const;

private:
    void dumpTo(std::string& out, int indent, int level) const;

    Kind mKind = Kind::Null;
    bool mBool = false;
    double mNumber = 0.0;
    std::string mString;
    std::vector<CJson> mElements;
    std::vector<std::pair<std::string, CJson>> mMembers;
};

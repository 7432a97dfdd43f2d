// What the parts of the caller share. The caller calls every function that the library exports and
// prints what comes of it.
#ifndef ORVADRCORE_TESTS_INSTALL_FIRST_VERSION_SHOW_H
#define ORVADRCORE_TESTS_INSTALL_FIRST_VERSION_SHOW_H

#include <cstddef>
#include <iostream>
#include <string>

#include <json/value.h>

#include <orvadrcore/response.h>

// Constructors and destructors are exported twice: for objects, and for the base part of an object of
// a class that the caller derives. Such a class calls the second ones.
template <class Base>
struct Derived : Base {
    using Base::Base;
};

template <class Value>
const Value& ToText(const Value& value)
{
    return value;
}

inline std::string ToText(const Json::Value& value)
{
    return OrvaDRCore::Response(value).toLine();
}

// Prints a line: Show{"found", db.SelectRecord(select, row), row.ToStr()}. Between braces the values are
// computed from left to right.
struct Show {
    template <class... Values>
    explicit Show(const std::string& what, Values... values)
    {
        std::cout << what << std::boolalpha;
        ((std::cout << ' ' << ToText(values)), ...);
        std::cout << std::endl;  // what follows may crash
    }
};

// Whether `text` ends with `end`. Shows a path without its directory.
inline bool EndsWith(const std::string& text, const std::string& end)
{
    return text.size() >= end.size() && text.substr(text.size() - end.size()) == end;
}

void CallValues();
void CallConditions();
void CallCommands();
void CallDatabase(const std::string& dir);
void CallFiles(const std::string& dir);
void CallCache(const std::string& dir);
void CallWebApi();

#endif

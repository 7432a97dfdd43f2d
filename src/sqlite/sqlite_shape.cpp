#include "sqlite/sqlite_shape.h"

#include <strings.h>

#include <algorithm>
#include <array>
#include <cstring>

namespace OrvaDRCore {

namespace {

// Longer conditions seldom come again, and would drive others out of the cache. SQLite's limits, where
// `-5` counts for more than a parameter, are far above.
constexpr std::size_t MaxTerms = 16;
constexpr std::size_t MaxDepth = 40;

constexpr std::size_t MaxDigits = 18;

// A larger integer in a condition may be compared with an indexed real exactly if it is a literal,
// but rounded to a real if it is bound.
constexpr std::int64_t MaxCompared = std::int64_t{1} << 53;

bool IsLetter(char character)
{
    return (character >= 'a' && character <= 'z') || (character >= 'A' && character <= 'Z') ||
           character == '_';
}

bool IsDigit(char character)
{
    return character >= '0' && character <= '9';
}

bool IsNamePart(char character)
{
    return IsLetter(character) || IsDigit(character);
}

// SQLite's planner expects more rows of `name=literal` for these integers, so they stay literals.
bool IsPlannedApart(const Shape::Literal& literal)
{
    const std::int64_t* const number = std::get_if<std::int64_t>(&literal);
    return number != nullptr && *number >= -1 && *number <= 1;
}

// Reads forward and never goes back. The zero byte after the text matches nothing.
class ShapeReader {
  public:
    ShapeReader(const std::string& statement, Shape& shape)
        : at_(statement.c_str()), end_(at_ + statement.size()), copied_(at_), shape_(shape)
    {
        shape_.text.clear();
        shape_.literals.clear();
    }

    bool Read()
    {
        shape_.isSelect = false;
        if (AcceptWord("INSERT")) return ReadInsert() && ReadEnd();
        if (AcceptWord("UPDATE")) return ReadUpdate() && ReadEnd();
        if (AcceptWord("DELETE")) return AcceptWord("FROM") && ReadTableAndWhere() && ReadEnd();
        shape_.isSelect = AcceptWord("SELECT");
        return shape_.isSelect && ReadSelect() && ReadEnd();
    }

  private:
    bool ReadInsert()
    {
        if (AcceptWord("OR") && !AcceptWord("REPLACE")) return false;
        return AcceptWord("INTO") && ReadTable() && Accept('(') && ReadNames() && Accept(')') &&
               AcceptWord("VALUES") && Accept('(') &&
               ReadCommaList([this] { return ReadStored(); }) && Accept(')');
    }

    bool ReadUpdate()
    {
        const auto readPair = [this] { return ReadName() && Accept('=') && ReadStored(); };
        return ReadTable() && AcceptWord("SET") && ReadCommaList(readPair) && AcceptWord("WHERE") &&
               ReadCondition();
    }

    bool ReadSelect()
    {
        return (Accept('*') || ReadNames()) && AcceptWord("FROM") && ReadTableAndWhere();
    }

    bool ReadTableAndWhere() { return ReadTable() && (!AcceptWord("WHERE") || ReadCondition()); }

    bool ReadCondition()
    {
        conditionBegin_ = shape_.literals.size();
        std::array<std::string_view, MaxTerms> equal;
        std::size_t terms = 0;
        std::size_t depth = 0;
        bool hasOr = false;
        do {
            while (Accept('(')) ++depth;
            if (depth > MaxDepth || terms == MaxTerms || !ReadTerm(equal.at(terms++))) return false;
            for (; Accept(')'); --depth) {
                if (depth == 0) return false;
            }
        } while (AcceptWord("AND") || (AcceptWord("OR") && (hasOr = true)));
        return depth == 0 && !(hasOr && HasSameTwice(equal.begin(), equal.begin() + terms));
    }

    // Sets `equal` to the name in `name=literal` and `name IN (literal)`.
    bool ReadTerm(std::string_view& equal)
    {
        const char* const begin = at_;
        if (!ReadName()) return false;
        const std::string_view name(begin, static_cast<std::size_t>(nameEnd_ - begin));
        if (AcceptWord("IS")) {
            AcceptWord("NOT");
            return AcceptWord("NULL");
        }
        const bool isList = AcceptWord("IN");
        if (isList || *at_ == '=') equal = name;
        if (isList) return ReadList();
        if (AcceptWord("NOT")) return AcceptWord("IN") && ReadList();
        return AcceptOperator() && ReadCompared();
    }

    // Only a list of one, of which SQLite makes `name=literal`. It uses a partial index for
    // `name IN (5,7)` only if these are literals, and then gives the rows in another order. It also
    // makes such a list of `name=5 OR name=7`.
    bool ReadList()
    {
        return Accept('(') && ReadLiteral() && !IsPlannedApart(literal_) && IsNewInCondition() &&
               Replace() && Accept(')');
    }

    // Whether a name is among these twice, in upper or lower case.
    template <class Iterator>
    static bool HasSameTwice(Iterator name, Iterator end)
    {
        for (; name != end; ++name) {
            const auto isSame = [name](std::string_view other) {
                return !other.empty() && other.size() == name->size() &&
                       ::strncasecmp(other.data(), name->data(), name->size()) == 0;
            };
            if (std::any_of(name + 1, end, isSame)) return true;
        }
        return false;
    }

    bool ReadCompared()
    {
        if (!ReadLiteral()) return false;
        return IsPlannedApart(literal_) ? SkipBlanks() : IsNewInCondition() && Replace();
    }

    // A value of an INSERT or an UPDATE.
    bool ReadStored() { return AcceptWord("NULL") || (ReadLiteral() && Replace()); }

    bool ReadNames()
    {
        return ReadCommaList([this] { return ReadName(); });
    }

    template <class ReadItem>
    bool ReadCommaList(ReadItem readItem)
    {
        do {
            if (!readItem()) return false;
        } while (Accept(','));
        return true;
    }

    // Reads a literal, which must end here: after 1 in "1AND" or 'a' in "'a''b'" it does not.
    bool ReadLiteral()
    {
        constexpr std::string_view Separators = " ,);";
        literalBegin_ = at_;
        if (!(*at_ == '\'' ? ReadText() : ReadInteger())) return false;
        return at_ == end_ || Separators.find(*at_) != std::string_view::npos;
    }

    bool ReadText()
    {
        const char* const begin = ++at_;
        const auto length = static_cast<std::size_t>(end_ - begin);
        const auto* const quote = static_cast<const char*>(std::memchr(begin, '\'', length));
        if (quote == nullptr) return false;
        const std::string_view text(begin, static_cast<std::size_t>(quote - begin));
        if (text.find('\0') != std::string_view::npos) return false;  // ends the statement
        literal_ = text;
        at_ = quote + 1;
        return true;
    }

    bool ReadInteger()
    {
        const bool isNegative = *at_ == '-';
        if (isNegative) ++at_;
        const char* const begin = at_;
        std::int64_t number = 0;
        while (IsDigit(*at_) && at_ < begin + MaxDigits) number = 10 * number + (*at_++ - '0');
        if (at_ == begin || IsDigit(*at_)) return false;
        literal_ = isNegative ? -number : number;
        return true;
    }

    // Two equal literals are one for SQLite: of `a=5 OR a<5` it makes `a<=5`. And see MaxCompared.
    bool IsNewInCondition() const
    {
        const std::int64_t* const number = std::get_if<std::int64_t>(&literal_);
        if (number != nullptr && (*number > MaxCompared || *number < -MaxCompared)) return false;
        const auto begin = shape_.literals.begin() + static_cast<std::ptrdiff_t>(conditionBegin_);
        return std::find(begin, shape_.literals.end(), literal_) == shape_.literals.end();
    }

    // Puts a parameter in the place of the literal that was read last.
    bool Replace()
    {
        if (shape_.literals.size() == MaxParameters) return false;
        shape_.text.append(copied_, literalBegin_);
        shape_.text += '?';
        copied_ = at_;
        shape_.literals.push_back(literal_);
        return SkipBlanks();
    }

    bool ReadEnd()
    {
        const char* const end = at_;
        if (*at_ == ';') ++at_;
        shape_.text.append(copied_, end);
        return at_ == end_ && !shape_.literals.empty();
    }

    bool ReadTable()
    {
        const char* const begin = at_;
        while (IsNamePart(*at_)) ++at_;
        const std::string_view name(begin, static_cast<std::size_t>(at_ - begin));
        return IsPlainName(name) && IsPlainTable(name) && SkipBlanks();
    }

    bool ReadName()
    {
        if (!IsLetter(*at_)) return false;
        while (IsNamePart(*at_)) ++at_;
        nameEnd_ = at_;
        return SkipBlanks();
    }

    // One of = == != <> < <= > >=.
    bool AcceptOperator()
    {
        const bool isLess = *at_ == '<';
        if (!isLess && *at_ != '=' && *at_ != '>' && *at_ != '!') return false;
        const bool isSingle = *at_++ != '!';
        const bool isDouble = *at_ == '=' || (isLess && *at_ == '>');
        if (isDouble) ++at_;
        return (isSingle || isDouble) && SkipBlanks();
    }

    bool AcceptWord(std::string_view word)
    {
        if (*at_ != word.front() || std::strncmp(at_, word.data(), word.size()) != 0 ||
            IsNamePart(at_[word.size()])) {
            return false;
        }
        at_ += word.size();
        return SkipBlanks();
    }

    bool Accept(char character)
    {
        if (*at_ != character) return false;
        ++at_;
        return SkipBlanks();
    }

    // Returns true, as the last step of what was read.
    bool SkipBlanks()
    {
        while (*at_ == ' ') ++at_;
        return true;
    }

    const char* at_;
    const char* const end_;
    const char* copied_;  // up to here the shape has the text
    Shape& shape_;
    Shape::Literal literal_;
    const char* literalBegin_ = nullptr;
    const char* nameEnd_ = nullptr;
    std::size_t conditionBegin_ = 0;  // the number of literals before the condition
};

}  // namespace

bool ReadShape(const std::string& statement, Shape& shape)
{
    return statement.size() <= MaxTextBytes && ShapeReader(statement, shape).Read();
}

bool IsPlainName(std::string_view name)
{
    return !name.empty() && !IsDigit(name.front()) &&
           std::all_of(name.begin(), name.end(), IsNamePart);
}

// Writing to a schema table does not count as a change of rows, and reading one of the tables that
// stand for pragmas may run the pragma.
bool IsPlainTable(std::string_view name)
{
    const auto hasPrefix = [name](std::string_view prefix) {
        return name.size() >= prefix.size() &&
               ::strncasecmp(name.data(), prefix.data(), prefix.size()) == 0;
    };
    return !hasPrefix("sqlite_") && !hasPrefix("pragma_");
}

int BindLiterals(sqlite3_stmt* statement, const Shape& shape, sqlite3_destructor_type copy)
{
    int place = 0;
    int code = SQLITE_OK;
    for (const Shape::Literal& literal : shape.literals) {
        ++place;
        if (const std::int64_t* const number = std::get_if<std::int64_t>(&literal)) {
            code = sqlite3_bind_int64(statement, place, *number);
        } else {
            const std::string_view text = std::get<std::string_view>(literal);
            code =
                sqlite3_bind_text64(statement, place, text.data(), text.size(), copy, SQLITE_UTF8);
        }
        if (code != SQLITE_OK) break;
    }
    return code;
}

}  // namespace OrvaDRCore

#include "table.h"

#include <algorithm>
#include <string_view>
#include <utility>

#include "text.h"

namespace Orvadr {

namespace {

constexpr std::size_t Gap = 2;
constexpr std::size_t Narrowest = 8;  // columns are not made narrower than this

using Lines = std::vector<std::string>;

struct Layout {
    std::vector<std::vector<Lines>> rows;  // the titles first
    std::vector<std::size_t> widths;
};

Lines SplitLines(const std::string& text)
{
    Lines lines;
    std::size_t at = 0;
    for (std::size_t end = text.find('\n'); end != std::string::npos; end = text.find('\n', at)) {
        lines.push_back(text.substr(at, end - at));
        at = end + 1;
    }
    lines.push_back(text.substr(at));
    return lines;
}

// The bytes of a line that fit into so many columns: up to a blank if there is one, else to where the
// column ends. At least one character.
std::size_t BytesThatFit(std::string_view line, std::size_t width)
{
    std::size_t bytes = 0;
    std::size_t columns = 0;
    std::size_t afterBlank = 0;
    while (bytes < line.size()) {
        const Glyph glyph = FirstGlyph(line.substr(bytes));
        columns += glyph.columns;
        if (columns > width && bytes > 0) return afterBlank > 0 ? afterBlank : bytes;
        bytes += glyph.bytes;
        if (line[bytes - 1] == ' ') afterBlank = bytes;
    }
    return bytes;
}

Lines Wrap(const Lines& lines, std::size_t width)
{
    Lines wrapped;
    for (std::string_view line : lines) {
        do {
            const std::size_t bytes = BytesThatFit(line, width);
            wrapped.emplace_back(line.substr(0, bytes));
            line.remove_prefix(bytes);
        } while (!line.empty());
    }
    return wrapped;
}

Layout Lay(const std::vector<Column>& columns, const Json::Value& objects)
{
    Layout layout;
    layout.rows.resize(objects.size() + 1);
    for (const Column& column : columns) {
        std::vector<Lines> cells;
        std::size_t width = 0;
        for (const Json::Value& object : objects) {
            cells.push_back(SplitLines(column.cell(object)));
            for (const std::string& line : cells.back()) width = std::max(width, ColumnsOf(line));
        }
        if (width == 0) continue;
        layout.widths.push_back(std::max(width, ColumnsOf(column.title)));
        layout.rows[0].push_back({column.title});
        for (std::size_t row = 0; row < cells.size(); ++row) {
            layout.rows[row + 1].push_back(std::move(cells[row]));
        }
    }
    return layout;
}

// Takes columns from the widest ones until the table fits, or until none can be made narrower.
void Fit(std::vector<std::size_t>& widths, std::size_t screen)
{
    std::size_t total = Gap * (widths.size() - 1);
    for (const std::size_t width : widths) total += width;
    for (; total > screen; --total) {
        const auto widest = std::max_element(widths.begin(), widths.end());
        if (*widest <= Narrowest) return;
        --*widest;
    }
}

const char* ColourOf(const std::string& state)
{
    constexpr const char* Green = "\033[32m";
    constexpr const char* Yellow = "\033[33m";
    constexpr const char* Red = "\033[31m";
    if (state == "fresh" || state == "free" || state == "ok") return Green;
    const bool isTrouble = state == "missing" || state == "unreadable" || state == "damaged";
    return isTrouble ? Red : Yellow;
}

std::string FormatRow(const std::vector<Lines>& cells, const std::vector<std::size_t>& widths,
                      std::size_t colouredColumn)
{
    std::size_t height = 1;
    for (const Lines& cell : cells) height = std::max(height, cell.size());
    std::string text;
    for (std::size_t line = 0; line < height; ++line) {
        std::size_t blanks = 0;  // written before the next text, so that no line ends in blanks
        for (std::size_t column = 0; column < cells.size(); ++column) {
            const std::string part = line < cells[column].size() ? cells[column][line] : "";
            if (!part.empty()) text.append(std::exchange(blanks, 0), ' ');
            const bool isColoured = column == colouredColumn && !part.empty();
            text += isColoured ? ColourOf(part) + part + "\033[0m" : part;
            blanks += widths[column] + Gap - std::min(widths[column], ColumnsOf(part));
        }
        text += '\n';
    }
    return text;
}

}  // namespace

Column TextColumn(const char* title, const char* key, const char* ifNull)
{
    return {title, [key, ifNull](const Json::Value& object) {
                const Json::Value& value = object[key];
                return value.isNull() ? ifNull : Printable(value.asString());
            }};
}

Column LinesColumn(const char* title, const char* key, std::string (*line)(const Json::Value&))
{
    return {title, [key, line](const Json::Value& object) {
                std::string lines;
                for (const Json::Value& element : object[key]) {
                    if (!lines.empty()) lines += '\n';
                    lines += line(element);
                }
                return lines;
            }};
}

std::string FormatTable(const std::vector<Column>& columns, const Json::Value& objects,
                        const Screen& screen)
{
    if (objects.empty()) return {};
    Layout layout = Lay(columns, objects);
    if (screen.columns > 0) Fit(layout.widths, screen.columns);

    const std::vector<Lines>& titles = layout.rows[0];
    std::size_t colouredColumn = titles.size();
    for (std::size_t column = 0; screen.hasColour && column < titles.size(); ++column) {
        if (titles[column][0] == "STATE") colouredColumn = column;
    }
    std::string text;
    for (std::vector<Lines>& row : layout.rows) {
        for (std::size_t column = 0; column < row.size(); ++column) {
            row[column] = Wrap(row[column], layout.widths[column]);
        }
        const bool isTitle = &row == &layout.rows.front();
        text += FormatRow(row, layout.widths, isTitle ? row.size() : colouredColumn);
    }
    return text;
}

}  // namespace Orvadr

# Rewrites a header or page for Doxygen, so that the reference looks right and the sources stay easy
# to read:
#
#     %s in a sentence           %%s, because Doxygen removes a "%" before a word
#     ERR, the log level         %ERR, or it would link to the class ERR
#     ## Some words              ## Some words {#PAGE-some-words}
#     [text](page.md#some-words) [text](@ref PAGE-some-words), PAGE being docs-page
#     [text](../include/d/x.h)   [text](@ref d/x.h)
#     [text](../src/x.cpp)       a link from build/docs/html to the source file
#     `it's`                     ``it's``, or the quote would end the code
#     **`code` first**           <b>`code` first</b>, or it would not be bold
#
# Code blocks, images and links to whole pages do not change.

# A link's path, relative to the top folder instead of the page.
function from_top(link,    path, parts, count, at, kept) {
    path = (link ~ /^\// ? "" : folder) link
    count = split(path, parts, "/")
    kept = ""
    for (at = 1; at <= count; ++at) {
        if (parts[at] == "..") sub(/[^\/]*\/$/, "", kept)
        else if (parts[at] != "." && parts[at] != "") kept = kept parts[at] (at < count ? "/" : "")
    }
    return kept
}

function label(page, heading) {
    sub(/\.md$/, "", page)
    gsub(/\//, "-", page)
    return page "-" heading
}

# The anchor that a repository's web view gives a heading.
function anchor(heading) {
    heading = tolower(heading)
    gsub(/[^a-z0-9 _-]/, "", heading)
    gsub(/ /, "-", heading)
    return heading
}

function in_reference(page) {
    return page ~ /^(README|CONTRIBUTING|CHANGELOG)\.md$/ || page ~ /^docs\/.*\.md$/
}

# [text](link), written for Doxygen.
function rewritten(text, link,    page, hash) {
    if (link ~ /^[a-z]+:/ || link ~ /^@ref /) return "[" text "](" link ")"
    hash = index(link, "#")
    page = hash == 1 ? path : from_top(hash ? substr(link, 1, hash - 1) : link)
    if (in_reference(page)) {
        return "[" text "](" (hash ? "@ref " label(page, substr(link, hash + 1)) : link) ")"
    }
    gsub(/`/, "", text)
    if (page ~ /^include\/.*\.h$/) return "[" text "](@ref " substr(page, length("include/") + 1) ")"
    return "<a href=\"../../../" page "\">" text "</a>"
}

function with_links(line,    done, found, close_at) {
    done = ""
    while (match(line, /!?\[[^][]*\]\([^() ]+\)/)) {
        found = substr(line, RSTART, RLENGTH)
        done = done substr(line, 1, RSTART - 1)
        line = substr(line, RSTART + RLENGTH)
        close_at = index(found, "](")
        done = done (found ~ /^!/ ? found : rewritten(substr(found, 2, close_at - 2),
            substr(found, close_at + 2, length(found) - close_at - 2)))
    }
    return done line
}

# Doubles the backticks of code that contains a single quote, which would end it.
function with_code(line,    done, span) {
    span = line
    if (index(line, "``") || gsub(/`/, "", span) % 2) return line
    done = ""
    while (match(line, /`[^`]+`/)) {
        span = substr(line, RSTART, RLENGTH)
        done = done substr(line, 1, RSTART - 1) (index(span, "'") ? "`" span "`" : span)
        line = substr(line, RSTART + RLENGTH)
    }
    return done line
}

# Marks bold text that begins with code. It may end on a later line.
function with_bold(line,    done, at) {
    done = ""
    while ((at = index(line, in_bold ? "**" : "**`")) > 0) {
        done = done substr(line, 1, at - 1) (in_bold ? "</b>" : "<b>")
        line = substr(line, at + 2)
        in_bold = !in_bold
    }
    return done line
}

# Escapes "%" and ERR, except between double quotes, where Doxygen changes nothing.
function with_marks(line,    parts, count, at, done) {
    count = split(line, parts, "\"")
    for (at = 1; at <= count; ++at) {
        if (at % 2 == 1 || at == count) {
            gsub(/%[A-Za-z]/, "%&", parts[at])
            gsub(/ERR([ ,]|: |$)/, "%&", parts[at])
        }
        done = done (at > 1 ? "\"" : "") parts[at]
    }
    return done
}

BEGIN {
    "pwd -P" | getline top
    top = top "/"
}

FNR == 1 {
    path = index(FILENAME, top) == 1 ? substr(FILENAME, length(top) + 1) : FILENAME
    folder = path
    sub(/[^\/]*$/, "", folder)
    page_file = path ~ /\.md$/
}

page_file && /^ *```/ { in_code = !in_code; print; next }
!page_file && /\/\/\/ +\\code/ { in_code = 1 }
!page_file && /\/\/\/ +\\endcode/ { in_code = 0 }
in_code { print; next }

page_file && /^##+ / {
    heading = $0
    sub(/^#+ +/, "", heading)
    name = anchor(heading)
    repeated = seen[name]++
    $0 = $0 " {#" label(path, name (repeated ? "-" repeated : "")) "}"
}

# Joins a link or image that is split over two lines.
page_file {
    while ($0 ~ /\[[^]]*$/ && (getline following) > 0) {
        if (following ~ /^ *$/) {
            $0 = $0 "\n"
            break
        }
        sub(/^ +/, "", following)
        $0 = $0 " " following
    }
    if ($0 ~ /^ *$/) in_bold = 0
    $0 = with_bold(with_code(with_links($0)))
}

page_file || /\/\/\// { $0 = with_marks($0) }
{ print }

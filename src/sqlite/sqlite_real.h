// Real numbers as SQL literals.
#ifndef ORVADRCORE_SRC_SQLITE_SQLITE_REAL_H
#define ORVADRCORE_SRC_SQLITE_SQLITE_REAL_H

#include <string>

namespace OrvaDRCore {

// Appends the shortest decimal text that reads back as the same number, with a point or an exponent;
// "9e999" and "-9e999" for the infinities, "NULL" for not-a-number. The locale does not matter.
//
// SQLite before 3.43 misreads a few of these texts by one unit in the last place. Where it would, 17
// to 19 digits are written instead, which it reads right. Only of the numbers between 2e-308 and
// 1e-290 it still misreads 9 %; for most of these there is no text that it reads right.
void AppendReal(std::string& text, double number);

}  // namespace OrvaDRCore

#endif

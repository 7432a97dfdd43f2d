// What callers may do with the public classes, most of it checked by the compiler alone.
#include <gtest/gtest.h>
#include <json/value.h>
#include <orvadrcore/cache.h>
#include <orvadrcore/errors.h>
#include <orvadrcore/file.h>
#include <orvadrcore/request.h>
#include <orvadrcore/response.h>
#include <orvadrcore/sqlite_command.h>
#include <orvadrcore/sqlite_condition.h>
#include <orvadrcore/sqlite_db.h>
#include <orvadrcore/sqlite_row.h>
#include <orvadrcore/sqlite_transaction.h>
#include <orvadrcore/sqlite_value.h>
#include <orvadrcore/utils.h>

#include <cstddef>
#include <cstdint>
#include <functional>
#include <map>
#include <memory>
#include <sstream>
#include <string>
#include <type_traits>
#include <vector>

namespace {

using namespace OrvaDRCore;  // NOLINT(google-build-using-namespace): every name is checked
using std::string;

// The overload of an operation that has exactly the given type; without one it does not compile.
template <class Signature>
constexpr bool Has(Signature operation)
{
    return operation != nullptr;
}

template <class T>
constexpr bool IsPlainValue = std::is_default_constructible_v<T>&& std::is_copy_constructible_v<T>&&
    std::is_copy_assignable_v<T>&& std::is_move_constructible_v<T>&& std::is_move_assignable_v<T>;

// ----------------------------------------------------------------------------------------- errors

static_assert(std::is_same_v<std::underlying_type_t<ERR::Code>, int>);
static_assert(std::is_convertible_v<ERR::Code, int>);
static_assert(!std::is_constructible_v<ERR>);
static_assert(ERR::ERR_DATABASE_OPERATION == 404 && ERR::ERR_DR_MAX == 673);
static_assert(Has<string (*)(int)>(&ERR::ToString));

// ----------------------------------------------------------------------------------------- values

static_assert(!std::is_polymorphic_v<SqliteValue>);
static_assert(IsPlainValue<SqliteValue>);
static_assert(std::is_nothrow_move_constructible_v<SqliteValue>);
// The only assignment. A move assignment would take the valid flag over.
static_assert(std::is_same_v<decltype(&SqliteValue::operator=),
                             SqliteValue& (SqliteValue::*)(const SqliteValue&)>);
static_assert(std::is_convertible_v<int, SqliteValue>);
static_assert(std::is_convertible_v<unsigned int, SqliteValue>);
static_assert(std::is_convertible_v<bool, SqliteValue>);
static_assert(std::is_convertible_v<string, SqliteValue>);
static_assert(std::is_convertible_v<const char*, SqliteValue>);
static_assert(!std::is_constructible_v<SqliteValue, std::nullptr_t>);
// Numbers that would silently lose bits.
static_assert(!std::is_constructible_v<SqliteValue, long>);
static_assert(!std::is_constructible_v<SqliteValue, unsigned long>);
static_assert(!std::is_constructible_v<SqliteValue, double>);

// Pointers that would become the boolean true.
static_assert(!std::is_constructible_v<SqliteValue, const unsigned char*>);
static_assert(!std::is_constructible_v<SqliteValue, unsigned char (&)[4]>);
static_assert(!std::is_constructible_v<SqliteValue, const signed char*>);
static_assert(!std::is_constructible_v<SqliteValue, const wchar_t*>);
static_assert(!std::is_constructible_v<SqliteValue, volatile char*>);
static_assert(!std::is_constructible_v<SqliteValue, const volatile char*>);
static_assert(!std::is_constructible_v<SqliteValue, void*>);
static_assert(!std::is_constructible_v<SqliteValue, const void*>);
static_assert(!std::is_constructible_v<SqliteValue, int*>);
static_assert(!std::is_constructible_v<SqliteValue, int (&)[4]>);
static_assert(!std::is_constructible_v<SqliteValue, bool*>);
static_assert(!std::is_constructible_v<SqliteValue, const char**>);
static_assert(!std::is_constructible_v<SqliteValue, const string*>);
static_assert(!std::is_constructible_v<SqliteValue, const SqliteValue*>);
static_assert(!std::is_constructible_v<SqliteValue, void (*)()>);
static_assert(!std::is_constructible_v<SqliteValue, void (&)()>);
static_assert(!std::is_constructible_v<SqliteValue, int std::pair<int, int>::*>);
static_assert(!std::is_constructible_v<SqliteValue, bool (SqliteValue::*)() const>);
// Still accepted: every kind of text, numbers, and proxies of a boolean.
static_assert(std::is_convertible_v<char*, SqliteValue>);
static_assert(std::is_convertible_v<char* const, SqliteValue>);
static_assert(std::is_convertible_v<const char (&)[4], SqliteValue>);
static_assert(std::is_convertible_v<char (&)[4], SqliteValue>);
static_assert(std::is_convertible_v<string&, SqliteValue>);
static_assert(std::is_constructible_v<SqliteValue, std::vector<bool>::reference>);
static_assert(std::is_convertible_v<const bool&, SqliteValue>);

// Such numbers have a name.
static_assert(Has<SqliteValue (*)(std::int64_t)>(&SqliteValue::Integer));
static_assert(Has<SqliteValue (*)(double)>(&SqliteValue::Real));
static_assert(Has<SqliteValue (*)(const string&)>(&SqliteValue::Text));
static_assert(Has<SqliteValue (*)(const char*)>(&SqliteValue::Text));
static_assert(Has<SqliteValue (*)(const string&)>(&SqliteValue::Blob));
static_assert(Has<SqliteValue (*)()>(&SqliteValue::Null));

static_assert(Has<bool (SqliteValue::*)() const>(&SqliteValue::IsValid));
static_assert(Has<bool (SqliteValue::*)() const>(&SqliteValue::IsNull));
static_assert(Has<string (SqliteValue::*)() const>(&SqliteValue::ToFormatedValue));
static_assert(Has<bool (SqliteValue::*)(string&) const>(&SqliteValue::GetValue<string>));
static_assert(Has<bool (SqliteValue::*)(bool&) const>(&SqliteValue::GetValue<bool>));
static_assert(Has<bool (SqliteValue::*)(int&) const>(&SqliteValue::GetValue<int>));
static_assert(
    Has<bool (SqliteValue::*)(std::int64_t&) const>(&SqliteValue::GetValue<std::int64_t>));
static_assert(Has<bool (SqliteValue::*)(double&) const>(&SqliteValue::GetValue<double>));
static_assert(
    Has<bool (SqliteValue::*)(unsigned int&) const>(&SqliteValue::GetValue<unsigned int>));

static_assert(IsPlainValue<SqliteValueList>);
static_assert(std::has_virtual_destructor_v<SqliteValueList>);
static_assert(std::is_nothrow_move_constructible_v<SqliteValueList>);
static_assert(
    Has<bool (SqliteValueList::*)(const string&, SqliteValue&&)>(&SqliteValueList::AddValue));
static_assert(
    Has<bool (SqliteValueList::*)(const string&, const SqliteValue&)>(&SqliteValueList::AddValue));
static_assert(Has<bool (SqliteValueList::*)(const string&) const>(&SqliteValueList::HasField));
static_assert(
    Has<const SqliteValue& (SqliteValueList::*)(const string&) const>(&SqliteValueList::GetValue));
static_assert(
    Has<bool (SqliteValueList::*)(const string&, string&) const>(&SqliteValueList::GetValue));
static_assert(
    Has<bool (SqliteValueList::*)(const string&, bool&) const>(&SqliteValueList::GetValue));
static_assert(
    Has<bool (SqliteValueList::*)(const string&, int&) const>(&SqliteValueList::GetValue));
static_assert(
    Has<bool (SqliteValueList::*)(const string&, unsigned int&) const>(&SqliteValueList::GetValue));
static_assert(
    Has<bool (SqliteValueList::*)(const string&, std::int64_t&) const>(&SqliteValueList::GetValue));
static_assert(
    Has<bool (SqliteValueList::*)(const string&, double&) const>(&SqliteValueList::GetValue));
static_assert(Has<SqliteValueList& (SqliteValueList::*)(const SqliteValueList&)>(
    &SqliteValueList::operator+=));
// Other types are refused by the compiler, not by the linker.
template <class T, class = void>
constexpr bool HasFieldOf = false;
template <class T>
constexpr bool HasFieldOf<T, std::void_t<decltype(std::declval<const SqliteValueList&>().GetValue(
                                 std::declval<string>(), std::declval<T&>()))>> = true;
static_assert(HasFieldOf<string> && HasFieldOf<bool> && HasFieldOf<int> &&
              HasFieldOf<unsigned int> && HasFieldOf<std::int64_t> && HasFieldOf<double>);
static_assert(!HasFieldOf<short> && !HasFieldOf<unsigned long> && !HasFieldOf<float> &&
              !HasFieldOf<char> && !HasFieldOf<const char*> && !HasFieldOf<SqliteValue>);
static_assert(Has<string (SqliteValueList::*)() const>(&SqliteValueList::ToStr));

static_assert(std::is_abstract_v<SqliteRecord>);
static_assert(std::has_virtual_destructor_v<SqliteRecord>);
static_assert(Has<SqliteValueList (SqliteRecord::*)(const std::vector<string>&) const>(
    &SqliteRecord::BuildRecord));
static_assert(Has<bool (SqliteRecord::*)(const SqliteValueList&)>(&SqliteRecord::LoadRecord));
static_assert(Has<std::vector<string> (SqliteRecord::*)() const>(&SqliteRecord::GetRecordFields));
static_assert(Has<SqliteValueList (SqliteRecord::*)() const>(&SqliteRecord::ToSqliteRecord));

// --------------------------------------------------------------------------------------- commands

static_assert(IsPlainValue<SqliteTableHandler>);
static_assert(std::has_virtual_destructor_v<SqliteTableHandler>);
static_assert(std::is_constructible_v<SqliteTableHandler, string, string>);
static_assert(Has<const string& (SqliteTableHandler::*)() const>(&SqliteTableHandler::GetName));
static_assert(Has<const string& (SqliteTableHandler::*)() const>(&SqliteTableHandler::GetSchema));

static_assert(std::is_abstract_v<SqliteCommand>);
static_assert(std::has_virtual_destructor_v<SqliteCommand>);
static_assert(Has<string (SqliteCommand::*)() const>(&SqliteCommand::GetCommand));
static_assert(Has<bool (SqliteCommand::*)() const>(&SqliteCommand::IsValid));
static_assert(Has<void (SqliteCommand::*)(std::stringstream&) const>(&SqliteCommand::DumpParam));
static_assert(Has<bool (SqliteCommand::*)(const SqliteTableHandler&)>(&SqliteCommand::SetTable));
static_assert(Has<const SqliteTableHandler& (SqliteCommand::*)() const>(&SqliteCommand::GetTable));
static_assert(Has<string (SqliteCommand::*)() const>(&SqliteCommand::ToStr));

// What every builder has; what those with values or a condition have in addition.
template <class T>
constexpr bool IsBuilder =
    std::is_base_of_v<SqliteCommand, T>&& IsPlainValue<T>&& std::has_virtual_destructor_v<T> &&
    !std::is_abstract_v<T>;
template <class T>
constexpr bool TakesValues =
    Has<void (T::*)(const SqliteValueList&)>(&T::SetFieldValues) &&
    Has<bool (T::*)(const string&, const string&)>(&T::template AddFieldValue<string>) &&
    Has<bool (T::*)(const string&, const bool&)>(&T::template AddFieldValue<bool>) &&
    Has<bool (T::*)(const string&, const int&)>(&T::template AddFieldValue<int>) &&
    Has<bool (T::*)(const string&, const unsigned int&)>(
        &T::template AddFieldValue<unsigned int>) &&
    Has<bool (T::*)(const string&, const SqliteValue&)>(&T::template AddFieldValue<SqliteValue>) &&
    Has<bool (T::*)(const string&, const char*)>(&T::AddFieldValue);
template <class Command, class T, class = void>
constexpr bool TakesValuesOf = false;
template <class Command, class T>
constexpr bool TakesValuesOf<Command, T,
                             std::void_t<decltype(std::declval<Command&>().AddFieldValue(
                                 std::declval<string>(), std::declval<T>()))>> = true;
template <class Command>
constexpr bool TakesNothingElse =
    TakesValuesOf<Command, string>&& TakesValuesOf<Command, const char*>&&
        TakesValuesOf<Command, char*>&& TakesValuesOf<Command, const char (&)[4]>&&
            TakesValuesOf<Command, int>&& TakesValuesOf<Command, unsigned int>&&
                TakesValuesOf<Command, bool>&& TakesValuesOf<Command, SqliteValue> &&
    !TakesValuesOf<Command, long> && !TakesValuesOf<Command, unsigned long> &&
    !TakesValuesOf<Command, double> && !TakesValuesOf<Command, const unsigned char*> &&
    !TakesValuesOf<Command, void*> && !TakesValuesOf<Command, int*>;
template <class T>
constexpr bool TakesACondition = Has<bool (T::*)(const string&)>(&T::SetCondition) &&
                                 Has<bool (T::*)(const SqliteCondition&)>(&T::SetCondition);

static_assert(IsBuilder<InsertCommand> && TakesValues<InsertCommand>);
static_assert(IsBuilder<UpdateCommand> && TakesValues<UpdateCommand>);
static_assert(TakesNothingElse<InsertCommand> && TakesNothingElse<UpdateCommand>);
static_assert(IsBuilder<SelectCommand>);
static_assert(TakesACondition<UpdateCommand> && TakesACondition<SelectCommand>);
static_assert(Has<void (InsertCommand::*)(bool)>(&InsertCommand::SetReplacable));
static_assert(Has<string (InsertCommand::*)() const>(&InsertCommand::ToFormatedInsertValues));
static_assert(Has<void (SelectCommand::*)()>(&SelectCommand::SelectAll));
static_assert(Has<bool (SelectCommand::*)(const string&)>(&SelectCommand::AddField));
static_assert(Has<bool (SelectCommand::*)(const string&)>(&SelectCommand::GroupBy));
static_assert(Has<bool (SelectCommand::*)(const string&, SqliteOrder)>(&SelectCommand::OrderBy));
static_assert(Has<void (SelectCommand::*)(std::uint64_t, std::uint64_t)>(&SelectCommand::Limit));
static_assert(SqliteOrder::Ascending != SqliteOrder::Descending);

// ------------------------------------------------------------------------------------- conditions

// Copied and passed by reference, never deleted through a base: by contract no virtual destructor.
template <class T>
constexpr bool IsCondition = std::is_base_of_v<SqliteCondition, T>&& std::is_polymorphic_v<T> &&
                             !std::has_virtual_destructor_v<T> && std::is_copy_constructible_v<T> &&
                             std::is_copy_assignable_v<T>;
template <class T, class Operand>
constexpr bool TakesTwo = IsCondition<T>&& std::is_default_constructible_v<T>&&
    std::is_constructible_v<T, string, Operand>&& Has<bool (T::*)(const string&, const Operand&)>(
        &T::SetValue);

static_assert(IsCondition<SqliteCondition> && IsPlainValue<SqliteCondition>);
static_assert(std::is_constructible_v<SqliteCondition, string>);
static_assert(Has<bool (SqliteCondition::*)() const>(&SqliteCondition::IsValid));
static_assert(Has<const string& (SqliteCondition::*)() const>(&SqliteCondition::GetCondition));
static_assert(TakesTwo<SqliteEqual, SqliteValue> && TakesTwo<SqliteNotEqual, SqliteValue>);
static_assert(TakesTwo<SqliteLess, SqliteValue> && TakesTwo<SqliteLessEqual, SqliteValue>);
static_assert(TakesTwo<SqliteGreater, SqliteValue> && TakesTwo<SqliteGreaterEqual, SqliteValue>);
static_assert(TakesTwo<SqliteContains, string> && TakesTwo<SqliteBeginsWith, string>);
static_assert(TakesTwo<SqliteAnd, string> && TakesTwo<SqliteOr, string>);
static_assert(TakesTwo<SqliteIn, string> && TakesTwo<SqliteIn, std::vector<SqliteValue>>);
static_assert(TakesTwo<SqliteNotIn, string> && TakesTwo<SqliteNotIn, std::vector<SqliteValue>>);
static_assert(std::is_base_of_v<SqliteInFamily, SqliteIn> &&
              std::is_base_of_v<SqliteInFamily, SqliteNotIn>);
static_assert(IsCondition<SqliteInFamily> && !std::is_default_constructible_v<SqliteInFamily>);
static_assert(std::is_constructible_v<SqliteInFamily, string>);
static_assert(std::is_constructible_v<SqliteInFamily, string, string, string>);
static_assert(std::is_constructible_v<SqliteInFamily, string, string, std::vector<SqliteValue>>);

// ------------------------------------------------------------------------------------- connection

static_assert(!std::is_polymorphic_v<SqliteDB>);
static_assert(!std::is_default_constructible_v<SqliteDB>);
static_assert(std::is_constructible_v<SqliteDB, string, unsigned int>);
static_assert(!std::is_copy_constructible_v<SqliteDB> && !std::is_copy_assignable_v<SqliteDB>);
static_assert(std::is_nothrow_move_constructible_v<SqliteDB>);
static_assert(std::is_nothrow_move_assignable_v<SqliteDB>);
static_assert(Has<bool (SqliteDB::*)()>(&SqliteDB::Open));
static_assert(Has<void (SqliteDB::*)()>(&SqliteDB::Close));
static_assert(Has<int (SqliteDB::*)() const>(&SqliteDB::GetErrCode));
static_assert(Has<const Json::Value& (SqliteDB::*)() const>(&SqliteDB::GetErr));
static_assert(Has<void (SqliteDB::*)(const string&, int, const char*) const>(&SqliteDB::SetDBErr));
static_assert(Has<bool (SqliteDB::*)(const string&)>(&SqliteDB::Exec));
static_assert(Has<bool (SqliteDB::*)(const string&)>(&SqliteDB::DoExecSqliteCommand));
static_assert(Has<bool (SqliteDB::*)(const string&, SqliteValueList&)>(&SqliteDB::SelectByCommand));
static_assert(Has<bool (SqliteDB::*)(const string&, std::vector<SqliteValueList>&)>(
    &SqliteDB::SelectByCommand));
static_assert(
    Has<bool (SqliteDB::*)(const string&, SqliteValueList&)>(&SqliteDB::DoSelectSqliteRecord));
static_assert(Has<bool (SqliteDB::*)(const string&, std::vector<SqliteValueList>&)>(
    &SqliteDB::DoSelectSqliteRecords));
static_assert(Has<bool (SqliteDB::*)(const string&)>(&SqliteDB::IsTableExisted));
static_assert(Has<bool (SqliteDB::*)(const SqliteTableHandler&)>(&SqliteDB::CreateTable));
static_assert(Has<bool (SqliteDB::*)(const InsertCommand&)>(&SqliteDB::InsertRecord));
static_assert(Has<bool (SqliteDB::*)(const SqliteTableHandler&, const std::vector<SqliteValueList>&,
                                     bool)>(&SqliteDB::InsertRecords));
static_assert(Has<bool (SqliteDB::*)(const UpdateCommand&)>(&SqliteDB::UpdateRecord));
static_assert(
    Has<bool (SqliteDB::*)(const SelectCommand&, SqliteValueList&)>(&SqliteDB::SelectRecord));
static_assert(Has<bool (SqliteDB::*)(const SelectCommand&, std::vector<SqliteValueList>&)>(
    &SqliteDB::SelectRecords));
static_assert(
    Has<bool (SqliteDB::*)(const SqliteTableHandler&, const string&)>(&SqliteDB::DoDelete));
static_assert(Has<bool (SqliteDB::*)(const SqliteTableHandler&)>(&SqliteDB::DeleteAllRecords));
static_assert(
    Has<bool (SqliteDB::*)(const string&, const SqliteTableHandler&)>(&SqliteDB::DeleteRecord));

using RowTaker = std::function<bool(const SqliteRow&)>;
static_assert(
    Has<bool (SqliteDB::*)(const SelectCommand&, const RowTaker&)>(&SqliteDB::SelectEach));
static_assert(
    Has<bool (SqliteDB::*)(const string&, const RowTaker&)>(&SqliteDB::SelectEachByCommand));
static_assert(Has<bool (SqliteDB::*)(const SelectCommand&, SqliteValueList&, bool&)>(
    &SqliteDB::SelectRecord));
static_assert(Has<bool (SqliteDB::*)(const std::vector<string>&)>(&SqliteDB::Upgrade));
static_assert(Has<std::int64_t (SqliteDB::*)() const>(&SqliteDB::GetAffectedRows));
static_assert(Has<std::int64_t (SqliteDB::*)() const>(&SqliteDB::GetLastInsertId));
static_assert(Has<int (SqliteDB::*)() const>(&SqliteDB::GetSqliteCode));

static_assert(!std::is_polymorphic_v<SqliteRow>);
static_assert(!std::is_copy_constructible_v<SqliteRow> && !std::is_copy_assignable_v<SqliteRow>);
static_assert(Has<std::size_t (SqliteRow::*)() const>(&SqliteRow::GetColumnCount));
static_assert(Has<string (SqliteRow::*)(std::size_t) const>(&SqliteRow::GetColumnName));
static_assert(Has<bool (SqliteRow::*)(const string&) const>(&SqliteRow::IsNull));

static_assert(!std::is_polymorphic_v<SqliteTransaction>);
static_assert(std::is_constructible_v<SqliteTransaction, SqliteDB&>);
static_assert(!std::is_convertible_v<SqliteDB&, SqliteTransaction>);
static_assert(!std::is_constructible_v<SqliteTransaction, SqliteDB>);
static_assert(!std::is_copy_constructible_v<SqliteTransaction> &&
              !std::is_copy_assignable_v<SqliteTransaction>);
static_assert(!std::is_move_constructible_v<SqliteTransaction> &&
              !std::is_move_assignable_v<SqliteTransaction>);
static_assert(Has<bool (SqliteTransaction::*)()>(&SqliteTransaction::Begin));
static_assert(Has<bool (SqliteTransaction::*)()>(&SqliteTransaction::Commit));
static_assert(Has<bool (SqliteTransaction::*)()>(&SqliteTransaction::Rollback));

// ------------------------------------------------------------------------------------------ files

template <class Key, class Value, class = void>
constexpr bool ReadsPairsInto = false;
template <class Key, class Value>
constexpr bool ReadsPairsInto<
    Key, Value,
    std::void_t<decltype(File::Read(string(), std::declval<std::map<Key, Value>&>()))>> = true;
static_assert(ReadsPairsInto<string, string> && ReadsPairsInto<string, int> &&
              ReadsPairsInto<string, double>);
static_assert(!ReadsPairsInto<string, long> && !ReadsPairsInto<string, bool> &&
              !ReadsPairsInto<string, float> && !ReadsPairsInto<int, string>);

// ------------------------------------------------------------------------------------------ cache

static_assert(Has<Json::Value (Cache::*)() const>(&Cache::Read));
static_assert(Has<const Json::Value& (Cache::*)() const>(&Cache::View));
static_assert(
    Has<CacheState (Cache::*)(std::chrono::milliseconds, Json::Value&) const>(&Cache::ReadWithin));
static_assert(Has<const string& (Cache::*)() const>(&Cache::GetPath));
static_assert(Has<Json::Value (Cache::*)() const>(&Cache::GetCachedData));

// ------------------------------------------------------------------------------ request and reply

static_assert(std::is_aggregate_v<UploadFileDescription> && IsPlainValue<UploadFileDescription>);
static_assert(std::is_same_v<decltype(UploadFileDescription::name), string>);
static_assert(std::is_same_v<decltype(UploadFileDescription::path), string>);

static_assert(IsPlainValue<Request>);
static_assert(std::has_virtual_destructor_v<Request>);
static_assert(std::is_constructible_v<Request, string, int, string, Json::Value>);
static_assert(std::is_constructible_v<Request, Json::Value>);
static_assert(Has<const string& (Request::*)() const>(&Request::getAPI));
static_assert(Has<const string& (Request::*)() const>(&Request::getMethod));
static_assert(Has<int (Request::*)() const>(&Request::getVersion));
static_assert(Has<const Json::Value& (Request::*)() const>(&Request::getParams));
static_assert(Has<int (Request::*)() const>(&Request::getTimeout));
static_assert(Has<const UploadFileDescription& (Request::*)() const>(&Request::getUploadFile));
static_assert(Has<bool (Request::*)() const>(&Request::isEncryptRequired));
static_assert(Has<void (Request::*)(const Json::Value&)>(&Request::setRequest));
static_assert(Has<void (Request::*)()>(&Request::clear));
static_assert(Has<void (Request::*)(int)>(&Request::setVersion));
static_assert(Has<void (Request::*)(const string&)>(&Request::setMethod));
static_assert(Has<void (Request::*)(const string&)>(&Request::setAPI));
static_assert(Has<void (Request::*)(int)>(&Request::setTimeout));
static_assert(Has<void (Request::*)(const UploadFileDescription&)>(&Request::setUploadFile));
static_assert(Has<bool (Request::*)(bool)>(&Request::setEncryptRequired));
static_assert(Has<bool (*)(const string&)>(&Request::isValidKey));
static_assert(Has<bool (Request::*)(const string&, const Json::Value&)>(&Request::addParam));
static_assert(Has<bool (Request::*)(const Json::Value&)>(&Request::addParam));
static_assert(Has<bool (Request::*)() const>(&Request::isValid));
static_assert(Has<Json::Value (Request::*)() const>(&Request::toJson));
static_assert(Has<string (Request::*)() const>(&Request::toStr));
static_assert(Has<bool (*)(const string&, Request&)>(&Request::FromText));

static_assert(IsPlainValue<Response>);
static_assert(std::has_virtual_destructor_v<Response>);
static_assert(std::is_constructible_v<Response, string>);
static_assert(std::is_constructible_v<Response, const char*>);
static_assert(std::is_constructible_v<Response, Json::Value>);
static_assert(Has<bool (Response::*)(const string&)>(&Response::setResp));
static_assert(Has<bool (Response::*)(const char*)>(&Response::setResp));
static_assert(Has<void (Response::*)(const Json::Value&)>(&Response::setResp));
static_assert(Has<void (Response::*)()>(&Response::clear));
static_assert(Has<Json::Value (*)(const Json::Value&)>(&Response::Success));
static_assert(Has<Json::Value (*)(int, const Json::Value&)>(&Response::Failure));
static_assert(Has<string (Response::*)() const>(&Response::toLine));
static_assert(Has<const Json::Value& (Response::*)() const>(&Response::getResp));
static_assert(Has<bool (Response::*)() const>(&Response::isValid));
static_assert(Has<bool (Response::*)() const>(&Response::isSuccess));
static_assert(Has<int (Response::*)() const>(&Response::getErrCode));
static_assert(Has<Json::Value (Response::*)() const>(&Response::getErrMsg));
static_assert(Has<Json::Value (Response::*)() const>(&Response::getErr));
static_assert(Has<bool (Response::*)() const>(&Response::hasData));
static_assert(Has<const Json::Value& (Response::*)() const>(&Response::getData));
static_assert(Has<bool (Response::*)(const char*) const>(&Response::hasDataField));
static_assert(Has<const Json::Value& (Response::*)(const char*) const>(&Response::getDataField));
static_assert(Has<string (Response::*)(const char*) const>(&Response::getDataFieldtoStr));
static_assert(Has<bool (Response::*)() const>(&Response::isPollFinish));
static_assert(Has<bool (Response::*)() const>(&Response::isPollSuccess));
static_assert(Has<string (Response::*)() const>(&Response::getTaskId));
static_assert(Has<bool (Response::*)(const char*) const>(&Response::hasField));
static_assert(Has<const Json::Value& (Response::*)(const char*) const>(&Response::getField));
static_assert(Has<bool (Response::*)() const>(&Response::hasAdditional));
static_assert(Has<const Json::Value& (Response::*)() const>(&Response::getAdditional));

// -------------------------------------------------------------------------------------- utilities

static_assert(Has<string (*)()>(&GenerateUUID));
static_assert(Has<bool (*)(unsigned int, unsigned int)>(&RandomSleepInMSec));
static_assert(Has<bool (*)(const string&)>(&Validator::IsVolPath));
template <class T>
constexpr bool IsJoined =
    Has<Json::Value (*)(const std::vector<T>&)>(&Container::ToJsonArray<T>) &&
    Has<string (*)(const std::vector<T>&, const string&)>(&Container::ToString<T>);
static_assert(IsJoined<string> && IsJoined<int> && IsJoined<bool> && IsJoined<double>);
template <class T, class = void>
constexpr bool CanBeAnArray = false;
template <class T>
constexpr bool
    CanBeAnArray<T, std::void_t<decltype(Container::ToJsonArray(std::declval<std::vector<T>>()))>> =
        true;
template <class T, class = void>
constexpr bool CanBeJoined = false;
template <class T>
constexpr bool CanBeJoined<
    T, std::void_t<decltype(Container::ToString(std::declval<std::vector<T>>(), string()))>> = true;
static_assert(CanBeAnArray<string> && CanBeJoined<string>);
static_assert(!CanBeAnArray<long> && !CanBeAnArray<const char*> && !CanBeAnArray<SqliteValue>);
static_assert(!CanBeJoined<long> && !CanBeJoined<const char*> && !CanBeJoined<unsigned int>);

// ----------------------------------------------------------------- which overload a literal picks

TEST(ApiTest, AStringLiteralIsATextAndNeverABoolean)
{
    EXPECT_EQ(SqliteValue("abc").ToFormatedValue(), "'abc'");
    EXPECT_EQ(SqliteEqual("name", "abc").GetCondition(), "name='abc'");
    EXPECT_EQ(SqliteIn("id", "SELECT 1").GetCondition(), "id IN ( SELECT 1 )");

    SqliteValueList list;
    EXPECT_TRUE(list.AddValue("name", "abc"));
    EXPECT_EQ(list.ToStr(), "name:'abc'");

    InsertCommand insert;
    EXPECT_TRUE(insert.AddFieldValue("name", "abc"));
    EXPECT_EQ(insert.ToFormatedInsertValues(), "(name) VALUES ('abc')");

    UpdateCommand update;
    EXPECT_TRUE(update.AddFieldValue("name", "abc"));
    EXPECT_TRUE(update.SetCondition("id=3"));
    EXPECT_EQ(update.ToStr(), "]condition:[id=3]/values:[name='abc']");

    EXPECT_TRUE(Response("{}").getResp().isObject());
    Response response;
    EXPECT_TRUE(response.setResp("{}"));
    EXPECT_TRUE(response.getResp().isObject());

    Request request;
    EXPECT_TRUE(request.addParam("name", "abc"));
    EXPECT_EQ(request.getParams()["name"].asString(), "abc");
}

TEST(ApiTest, AnElementOfAVectorOfBooleansIsABoolean)
{
    std::vector<bool> flags{true, false};
    EXPECT_EQ(SqliteValue(flags[0]).ToFormatedValue(), "1");
    EXPECT_EQ(SqliteValue(flags[1]).ToFormatedValue(), "0");
    bool flag = false;
    EXPECT_TRUE(SqliteValue(flags[0]).GetValue(flag));
    EXPECT_TRUE(flag);
}

TEST(ApiTest, ABufferIsATextToo)
{
    char buffer[] = "abc";
    char* const pointer = buffer;
    InsertCommand insert;
    EXPECT_TRUE(insert.AddFieldValue("a", buffer));
    EXPECT_TRUE(insert.AddFieldValue("b", pointer));
    EXPECT_EQ(insert.ToFormatedInsertValues(), "(a,b) VALUES ('abc','abc')");

    UpdateCommand update;
    EXPECT_TRUE(update.AddFieldValue("a", buffer));
    EXPECT_TRUE(update.AddFieldValue("b", pointer));
    EXPECT_EQ(update.ToStr(), "]condition:[]/values:[a='abc',b='abc']");
}

TEST(ApiTest, NumbersAndBooleansKeepTheirKind)
{
    InsertCommand insert;
    EXPECT_TRUE(insert.AddFieldValue("a", -1));
    EXPECT_TRUE(insert.AddFieldValue("b", 4294967295U));
    EXPECT_TRUE(insert.AddFieldValue("c", true));
    EXPECT_TRUE(insert.AddFieldValue("d", string("x")));
    EXPECT_EQ(insert.ToFormatedInsertValues(), "(a,b,c,d) VALUES (-1,4294967295,1,'x')");
    EXPECT_EQ(SqliteIn("id", std::vector<SqliteValue>{1, true, "x"}).GetCondition(),
              "id IN ( 1,1,'x' )");
}

TEST(ApiTest, AnErrorCodeIsAnInt)
{
    const int code = ERR::BAD_PARAMETER;
    EXPECT_EQ(code, 401);
    EXPECT_EQ(ERR::ToString(ERR::BAD_PARAMETER), "BAD_PARAMETER");
}

TEST(ApiTest, AssigningDoesNotMakeAValueValid)
{
    SqliteValue value;
    value = SqliteValue(1);  // the contract: neither a copy nor a move takes the flag along
    EXPECT_FALSE(value.IsValid());
    const SqliteValue one(1);
    value = one;
    EXPECT_FALSE(value.IsValid());
}

// --------------------------------------------------------------------------------- derived classes

// Counts its destructions: deleting it through its base must reach its destructor.
template <class Base>
class Derived : public Base {
  public:
    explicit Derived(int& count) : destructions_(count) {}
    Derived(const Derived&) = delete;
    Derived& operator=(const Derived&) = delete;
    ~Derived() override { ++destructions_; }

  private:
    int& destructions_;
};

TEST(ApiTest, ClassesThatCallersDeriveFromAreDeletedThroughTheirBase)
{
    int destructions = 0;
    std::unique_ptr<Request>(new Derived<Request>(destructions)).reset();
    std::unique_ptr<Response>(new Derived<Response>(destructions)).reset();
    std::unique_ptr<SqliteValueList>(new Derived<SqliteValueList>(destructions)).reset();
    std::unique_ptr<SqliteTableHandler>(new Derived<SqliteTableHandler>(destructions)).reset();
    std::unique_ptr<SqliteCommand>(new Derived<InsertCommand>(destructions)).reset();
    std::unique_ptr<SqliteCommand>(new Derived<UpdateCommand>(destructions)).reset();
    std::unique_ptr<SqliteCommand>(new Derived<SelectCommand>(destructions)).reset();
    EXPECT_EQ(destructions, 7);
}

}  // namespace

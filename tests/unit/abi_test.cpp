// What programs that are already linked rely on: the slots of virtual operations and the places of
// data members. This source is compiled without access control, to see the latter.
#include <gtest/gtest.h>
#include <orvadrcore/cache.h>
#include <orvadrcore/file_lock.h>
#include <orvadrcore/request.h>
#include <orvadrcore/response.h>
#include <orvadrcore/sqlite_command.h>
#include <orvadrcore/sqlite_condition.h>
#include <orvadrcore/sqlite_db.h>
#include <orvadrcore/sqlite_transaction.h>
#include <orvadrcore/sqlite_value.h>

#include <algorithm>
#include <cstddef>
#include <cstdint>
#include <cstring>
#include <functional>
#include <initializer_list>

namespace {

using OrvaDRCore::Cache;
using OrvaDRCore::FileLock;
using OrvaDRCore::InsertCommand;
using OrvaDRCore::Request;
using OrvaDRCore::Response;
using OrvaDRCore::SelectCommand;
using OrvaDRCore::SqliteCommand;
using OrvaDRCore::SqliteCondition;
using OrvaDRCore::SqliteDB;
using OrvaDRCore::SqliteInFamily;
using OrvaDRCore::SqliteRecord;
using OrvaDRCore::SqliteTableHandler;
using OrvaDRCore::SqliteTransaction;
using OrvaDRCore::SqliteValue;
using OrvaDRCore::SqliteValueList;
using OrvaDRCore::UpdateCommand;

// ------------------------------------------------------------------------------------------- slots

// The slots of the virtual operations are part of the binary interface of every class that callers
// derive from or call through. A pointer to a virtual operation tells its slot: it holds
// the offset in the table of operations, and a low bit, in one place or the other, that tells it
// from the address of an operation that is not virtual.
template <class Operation>
int Slot(Operation operation)
{
    struct {
        std::intptr_t position;
        std::intptr_t adjustment;
    } parts{};
    static_assert(sizeof parts == sizeof operation);
    std::memcpy(&parts, &operation, sizeof parts);
    EXPECT_EQ((parts.position | parts.adjustment) & 1, 1) << "not virtual";
    return static_cast<int>(parts.position / static_cast<std::intptr_t>(sizeof(void*)));
}

// How many slots a class has: its subclass's first new operation comes after them. A virtual
// destructor takes two.
template <class Base>
int SlotCount()
{
    struct Derived : Base {  // NOLINT(cppcoreguidelines-virtual-class-destructor)
        virtual void Added() {}
    };
    return Slot(&Derived::Added);
}

TEST(SlotTest, ACommandsOperationsKeepTheirSlots)
{
    EXPECT_EQ(Slot(&SqliteCommand::GetCommand), 2);  // after the destructor
    EXPECT_EQ(Slot(&SqliteCommand::IsValid), 3);
    EXPECT_EQ(Slot(&SqliteCommand::DumpParam), 4);
    EXPECT_EQ(SlotCount<SqliteCommand>(), 5);
    EXPECT_EQ(SlotCount<InsertCommand>(), 5);
    EXPECT_EQ(SlotCount<UpdateCommand>(), 5);
    EXPECT_EQ(SlotCount<SelectCommand>(), 5);
}

TEST(SlotTest, ARecordsOperationsKeepTheirSlots)
{
    EXPECT_EQ(Slot(&SqliteRecord::BuildRecord), 0);
    EXPECT_EQ(Slot(&SqliteRecord::LoadRecord), 1);
    EXPECT_EQ(Slot(&SqliteRecord::GetRecordFields), 2);
    EXPECT_EQ(SlotCount<SqliteRecord>(), 5);  // the destructor at the end
}

TEST(SlotTest, AConditionsOneOperationIsItsValidity)
{
    EXPECT_EQ(Slot(&SqliteCondition::IsValid), 0);
    EXPECT_EQ(SlotCount<SqliteCondition>(), 1);
    EXPECT_EQ(SlotCount<SqliteInFamily>(), 1);
}

TEST(SlotTest, TablesAndListsHaveNothingButTheirDestructor)
{
    EXPECT_EQ(SlotCount<SqliteTableHandler>(), 2);
    EXPECT_EQ(SlotCount<SqliteValueList>(), 2);
}

TEST(SlotTest, ACachesOperationsKeepTheirSlots)
{
    EXPECT_EQ(Slot(&Cache::GetInfo), 2);  // after the destructor
    EXPECT_EQ(Slot(&Cache::GetDefaultValue), 3);
    EXPECT_EQ(Slot(&Cache::GetUpdatedData), 4);
    EXPECT_EQ(Slot(&Cache::IsValidData), 5);
    EXPECT_EQ(Slot(&Cache::IsNeedUpdate), 6);
    EXPECT_EQ(Slot(&Cache::IsUpdatedDataRequired), 7);
    EXPECT_EQ(SlotCount<Cache>(), 8);
}

TEST(SlotTest, RequestsAndResponsesHaveNothingButTheirDestructor)
{
    EXPECT_EQ(SlotCount<Request>(), 2);
    EXPECT_EQ(SlotCount<Response>(), 2);
}

// ----------------------------------------------------------------------------------------- members

// The first member's place, and each other's after the one before it.
void ExpectInOrder(std::size_t first, std::initializer_list<std::size_t> offsets)
{
    EXPECT_EQ(*offsets.begin(), first);
    EXPECT_EQ(std::adjacent_find(offsets.begin(), offsets.end(), std::greater_equal<>()),
              offsets.end());
}

// The first place for a member of that type, after the pointer to the table of virtual operations.
template <class Member = void*>
constexpr std::size_t BehindTable = std::max(sizeof(void*), alignof(Member));
constexpr std::size_t BehindCommand = sizeof(SqliteCommand);

TEST(MemberTest, ValuesAndRecordsKeepTheirOrder)
{
    ExpectInOrder(0, {offsetof(SqliteValue, valid_), offsetof(SqliteValue, kind_),
                      offsetof(SqliteValue, number_), offsetof(SqliteValue, bytes_)});
    ExpectInOrder(BehindTable<SqliteValue>,
                  {offsetof(SqliteValueList, invalidValue_), offsetof(SqliteValueList, values_),
                   offsetof(SqliteValueList, unsorted_)});
    EXPECT_EQ(sizeof(SqliteRecord), BehindTable<>);
}

TEST(MemberTest, CommandsKeepTheirOrder)
{
    ExpectInOrder(BehindTable<>,
                  {offsetof(SqliteTableHandler, name_), offsetof(SqliteTableHandler, schema_)});
    ExpectInOrder(BehindTable<>, {offsetof(SqliteCommand, table_)});
    ExpectInOrder(BehindCommand,
                  {offsetof(InsertCommand, replacable_), offsetof(InsertCommand, fieldValues_)});
    ExpectInOrder(BehindCommand,
                  {offsetof(UpdateCommand, condition_), offsetof(UpdateCommand, fieldValues_)});
    ExpectInOrder(BehindCommand,
                  {offsetof(SelectCommand, selectAll_), offsetof(SelectCommand, fields_),
                   offsetof(SelectCommand, condition_), offsetof(SelectCommand, groups_),
                   offsetof(SelectCommand, orders_), offsetof(SelectCommand, limit_)});
}

TEST(MemberTest, AConnectionIsOnePointer)
{
    ExpectInOrder(0, {offsetof(SqliteDB, connection_)});
    EXPECT_EQ(sizeof(SqliteDB), sizeof(void*));
}

TEST(MemberTest, TransactionsKeepTheirOrder)
{
    // The connection is a reference, which has no offset.
    ExpectInOrder(sizeof(void*),
                  {offsetof(SqliteTransaction, hasBegun_), offsetof(SqliteTransaction, number_)});
}

TEST(MemberTest, LocksAndCachesKeepTheirOrder)
{
    ExpectInOrder(0, {offsetof(FileLock, fd_), offsetof(FileLock, path_)});
    ExpectInOrder(BehindTable<>, {offsetof(Cache, impl_)});
}

TEST(MemberTest, RequestsAndResponsesKeepTheirOrder)
{
    ExpectInOrder(BehindTable<>,
                  {offsetof(Request, version_), offsetof(Request, timeout_),
                   offsetof(Request, api_), offsetof(Request, method_), offsetof(Request, params_),
                   offsetof(Request, encryptRequired_), offsetof(Request, uploadFile_)});
    ExpectInOrder(BehindTable<Json::Value>,
                  {offsetof(Response, emptyValue_), offsetof(Response, resp_)});
}

}  // namespace

// class_rows.cpp - the classes of the contract by type id, for random_objects.h. One unit for each part of
// the contract (ROWS_OF, ROWS_NAME), so that the compiler can work on several at once.
#include "class_list.h"
#include "support/random_objects.h"

using namespace random_objects;

const class_row *ROWS_NAME(int type_id)
{
    switch (type_id) {
#define ROW(T)                                                                                               \
    case binding::traits<T>::type_id:                                                                        \
        return &row<T>;
        ROWS_OF(ROW)
#undef ROW
    default:
        return nullptr;
    }
}

# The test over every class: one unit of rows for each namespace.
set(CLASS_PREFIXES protocol protocolProfile protocolHTTP protocolProblemReport protocolPRFilter protocolUpdateOrder
    protocolUpdateOrderFilter protocolInventoryReport protocolStatusReport)
set(class_row_units)
foreach(prefix ${CLASS_PREFIXES})
    set(unit ${PROJECT_BINARY_DIR}/class_rows/${prefix}.cpp)
    file(CONFIGURE OUTPUT ${unit} CONTENT
        "#define ROWS_OF CLASSES_OF_${prefix}\n#define ROWS_NAME rows_${prefix}\n#include \"classes/class_rows.cpp\"\n" @ONLY)
    list(APPEND class_row_units ${unit})
endforeach()
zuv_add_test(classes_test ${PROJECT_SOURCE_DIR}/tests/classes/classes_test.cpp
    ${PROJECT_SOURCE_DIR}/tests/classes/graph_test.cpp ${class_row_units})

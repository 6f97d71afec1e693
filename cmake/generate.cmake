# Generated code: builds contract2cpp, and runs it over the contract while building.
find_package(pugixml REQUIRED)
file(GLOB CONTRACT2CPP_SOURCES CONFIGURE_DEPENDS ${PROJECT_SOURCE_DIR}/tools/contract2cpp/*.cpp)
list(REMOVE_ITEM CONTRACT2CPP_SOURCES ${PROJECT_SOURCE_DIR}/tools/contract2cpp/main.cpp)
add_library(contract_translator STATIC ${CONTRACT2CPP_SOURCES})
target_include_directories(contract_translator PUBLIC ${PROJECT_SOURCE_DIR}/tools/contract2cpp)
target_link_libraries(contract_translator PUBLIC pugixml::pugixml PRIVATE zuv_flags)
add_executable(contract2cpp ${PROJECT_SOURCE_DIR}/tools/contract2cpp/main.cpp)
target_link_libraries(contract2cpp PRIVATE contract_translator zuv_flags)

# As in tools/contract2cpp/layout.h.
set(CLASSES_PER_UNIT 40)
set(PORTS_WITHOUT_PROXY ProblemReport)

# The files that contract2cpp writes below `out` for the contract in `schema`: public headers into `headers`, sources and
# private headers into `sources`.
function(zuv_contract_outputs schema out headers sources)
    file(STRINGS ${schema}/type_ids.txt rows REGEX "^[0-9]+ +(class|enum) ")
    set(prefixes)
    foreach(row ${rows})
        if(row MATCHES "^[0-9]+ +class +_?([A-Za-z0-9]+)__")
            list(APPEND prefixes ${CMAKE_MATCH_1})
            math(EXPR count_${CMAKE_MATCH_1} "0${count_${CMAKE_MATCH_1}} + 1")
        elseif(row MATCHES "^[0-9]+ +enum +([A-Za-z0-9]+):")
            list(APPEND prefixes ${CMAKE_MATCH_1})
        endif()
    endforeach()
    list(REMOVE_DUPLICATES prefixes)
    set(public ${out}/include/zuv_client_pro/type_ids.h)
    set(private ${out}/src/class_list.h ${out}/src/registry_tables.cpp ${out}/src/contract_namespaces.cpp ${out}/src/contract_namespaces.h)
    foreach(prefix ${prefixes})
        list(APPEND public ${out}/include/zuv_client_pro/${prefix}.h)
        list(APPEND private ${out}/src/traits_${prefix}.h)
        set(units 1)
        if(DEFINED count_${prefix})
            math(EXPR units "(${count_${prefix}} + ${CLASSES_PER_UNIT} - 1) / ${CLASSES_PER_UNIT}")
        endif()
        foreach(unit RANGE 1 ${units})
            list(APPEND private ${out}/src/classes_${prefix}_${unit}.cpp)
        endforeach()
    endforeach()
    file(GLOB_RECURSE ports CONFIGURE_DEPENDS ${schema}/*.wsdl)
    foreach(path ${ports})
        get_filename_component(port ${path} NAME_WE)
        if(port IN_LIST PORTS_WITHOUT_PROXY)
            list(APPEND public ${out}/include/zuv_client_pro/${port}SoapBinding.h)
        else()
            list(APPEND public ${out}/include/zuv_client_pro/${port}SoapBindingProxy.h)
            list(APPEND private ${out}/src/${port}SoapBindingProxy.cpp)
        endif()
    endforeach()
    set(${headers} ${public} PARENT_SCOPE)
    set(${sources} ${private} PARENT_SCOPE)
endfunction()

# Translates the contract in `schema` while building, below `out`. What is written: see zuv_contract_outputs, and what the
# command line is made from, in out/tools. Further arguments go to the generator.
function(zuv_translate_contract schema out headers sources)
    zuv_contract_outputs(${schema} ${out} public private)
    file(GLOB_RECURSE contract CONFIGURE_DEPENDS ${schema}/*.xsd ${schema}/*.wsdl ${schema}/*.txt)
    set_property(DIRECTORY APPEND PROPERTY CMAKE_CONFIGURE_DEPENDS ${schema}/type_ids.txt)
    add_custom_command(
        OUTPUT ${public} ${private} ${out}/tools/operation_list.h ${out}/tools/contract_description.cpp
        COMMAND contract2cpp --schema ${schema} --out ${out} ${ARGN}
        DEPENDS contract2cpp ${contract}
        COMMENT "Translating the contract in ${schema}"
        VERBATIM)
    set(${headers} ${public} PARENT_SCOPE)
    set(${sources} ${private} PARENT_SCOPE)
endfunction()

# The contract of the library. Its private headers are for what works on the binding, tests included.
set(ZUV_GENERATED_DIR ${PROJECT_BINARY_DIR}/generated)
zuv_translate_contract(${PROJECT_SOURCE_DIR}/schema ${ZUV_GENERATED_DIR} ZUV_GENERATED_HEADERS ZUV_GENERATED_SOURCES
    --authority ${ZUV_AUTHORITY})
add_custom_target(zuv_generated DEPENDS ${ZUV_GENERATED_HEADERS} ${ZUV_GENERATED_SOURCES})
add_dependencies(zuv_objects zuv_generated)
target_sources(zuv_objects PRIVATE ${ZUV_GENERATED_SOURCES} ${ZUV_GENERATED_HEADERS})
target_include_directories(zuv_objects PUBLIC ${ZUV_GENERATED_DIR}/include PRIVATE ${ZUV_GENERATED_DIR}/src)

# Generated code: builds contract2cpp, and runs it over the contract while building.
if(ZUV_CONTRACT2CPP)
    add_executable(contract2cpp IMPORTED)
    set_target_properties(contract2cpp PROPERTIES IMPORTED_LOCATION ${ZUV_CONTRACT2CPP})
elseif(CMAKE_CROSSCOMPILING AND NOT CMAKE_CROSSCOMPILING_EMULATOR)
    message(FATAL_ERROR "contract2cpp runs while building: build it for this machine (cmake --build ... --target contract2cpp), "
        "and name it by -DZUV_CONTRACT2CPP=FILE")
else()
    find_package(pugixml REQUIRED)
    file(GLOB CONTRACT2CPP_SOURCES CONFIGURE_DEPENDS ${PROJECT_SOURCE_DIR}/tools/contract2cpp/*.cpp)
    list(REMOVE_ITEM CONTRACT2CPP_SOURCES ${PROJECT_SOURCE_DIR}/tools/contract2cpp/main.cpp)
    add_library(contract_translator STATIC ${CONTRACT2CPP_SOURCES})
    target_include_directories(contract_translator PUBLIC ${PROJECT_SOURCE_DIR}/tools/contract2cpp)
    target_link_libraries(contract_translator PUBLIC pugixml::pugixml PRIVATE zuv_flags)
    add_executable(contract2cpp ${PROJECT_SOURCE_DIR}/tools/contract2cpp/main.cpp)
    target_link_libraries(contract2cpp PRIVATE contract_translator zuv_flags)
endif()

# Translates the contract in `schema` while building, below `out`: public headers into `headers`, sources and private headers
# into `sources`, and into out/tools what the command line is made from. Which files these are is in outputs.txt next to the
# contract, against which the generator checks what it writes. Further arguments go to the generator.
function(zuv_translate_contract schema out headers sources)
    file(STRINGS ${schema}/outputs.txt outputs)
    list(TRANSFORM outputs PREPEND ${out}/)
    set(public ${outputs})
    set(private ${outputs})
    list(FILTER public INCLUDE REGEX "^${out}/include/")
    list(FILTER private INCLUDE REGEX "^${out}/src/")
    file(GLOB_RECURSE contract CONFIGURE_DEPENDS ${schema}/*.xsd ${schema}/*.wsdl ${schema}/*.txt)
    set_property(DIRECTORY APPEND PROPERTY CMAKE_CONFIGURE_DEPENDS ${schema}/outputs.txt)
    add_custom_command(
        OUTPUT ${outputs}
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

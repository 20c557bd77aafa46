# Read by find_package(Varnex): defines Varnex::Runtime.
include(CMakeFindDependencyMacro)
find_dependency(Threads)
list(PREPEND CMAKE_MODULE_PATH ${CMAKE_CURRENT_LIST_DIR})
find_dependency(LZ4Library)
list(POP_FRONT CMAKE_MODULE_PATH)
include(${CMAKE_CURRENT_LIST_DIR}/VarnexTargets.cmake)

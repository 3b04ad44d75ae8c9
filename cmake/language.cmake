# The language of every target: C++17, or what the caller asks for beyond it.
if(NOT CMAKE_CXX_STANDARD MATCHES "^(17|2.)$")
  set(CMAKE_CXX_STANDARD 17)
endif()
set(CMAKE_CXX_STANDARD_REQUIRED ON)
if(NOT DEFINED CMAKE_CXX_EXTENSIONS)
  set(CMAKE_CXX_EXTENSIONS OFF)
endif()

# Each source has log numbers of its own under one name: it is a unit by itself.
set(CMAKE_UNITY_BUILD OFF)

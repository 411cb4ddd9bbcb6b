# Sourced by the scripts that build: the CMake arguments (array compiler_cache) that compile through
# ccache where it is installed, none where it is not. A build in a fresh checkout (CI makes one every
# time) then takes what an earlier build compiled from the same sources. The paths inside the checkout
# are hashed relative to it and the build folder's own path is left out, so another checkout's build
# hits as well; the two sloppiness options are what precompiled headers need, and the times of headers
# generated during the build (moc's, the precompiled header's) do not count.
compiler_cache=()
if command -v ccache >/dev/null; then
  launcher="env;CCACHE_BASEDIR=$PWD;CCACHE_NOHASHDIR=true"
  launcher+=";CCACHE_SLOPPINESS=pch_defines,time_macros,include_file_mtime,include_file_ctime;ccache"
  compiler_cache=(-DCMAKE_C_COMPILER_LAUNCHER="$launcher" -DCMAKE_CXX_COMPILER_LAUNCHER="$launcher")
fi

# The module, libqxesm.so. Its objects are a library of their own, so that tests reach what the module hides.
set(BLA_VENDOR Generic)
find_package(BLAS REQUIRED)

add_library(qxesm_objects OBJECT
  frame/entry.cpp
  frame/instance.cpp
  frame/table.cpp
  store/api.cpp
  store/assembly.cpp
  store/closing.cpp
  store/copying.cpp
  store/extraction.cpp
  store/lifecycle.cpp
  store/nodes.cpp
  store/sizing.cpp
  store/waiting.cpp
  cholesky/api.cpp
  cholesky/band_solver.cpp
  cholesky/block_factor.cpp
  cholesky/block_tree.cpp
  cholesky/block_update.cpp
  cholesky/blocks.cpp
  cholesky/dense.cpp
  cholesky/factor.cpp
  cholesky/ginverse2.cpp
  cholesky/ginverse2_blocked.cpp
  cholesky/given_order.cpp
  cholesky/group_panel.cpp
  cholesky/inverse_columns.cpp
  cholesky/inverse_diagonal.cpp
  cholesky/inverse_fronts.cpp
  cholesky/inverse_gather.cpp
  cholesky/inverse_panels.cpp
  cholesky/inverse_pattern.cpp
  cholesky/inverse_square.cpp
  cholesky/numeric.cpp
  cholesky/numeric_blocked.cpp
  cholesky/numeric_rows.cpp
  cholesky/ordering.cpp
  cholesky/ordering_plain.cpp
  cholesky/refill.cpp
  cholesky/reorder.cpp
  cholesky/reorder_border.cpp
  cholesky/selected_inverse.cpp
  cholesky/shared_tails.cpp
  cholesky/slabs.cpp
  cholesky/solve.cpp
  cholesky/sparse_solve.cpp
  cholesky/substitution_avx2.cpp
  cholesky/substitution_avx512.cpp
  cholesky/substitution_portable.cpp
  cholesky/symbolic.cpp
  cholesky/tiles.cpp
  cholesky/tiles_avx2.cpp
  cholesky/tiles_avx512.cpp
  cholesky/tiles_portable.cpp
  forms/api.cpp
  forms/inverse_forms.cpp
  forms/kernels.cpp
  forms/multiply.cpp
  forms/passes_avx2.cpp
  forms/passes_avx512.cpp
  forms/passes_portable.cpp
  forms/products.cpp
  forms/quadratic.cpp
  forms/scaling.cpp
  forms/sum.cpp
  forms/tree_products.cpp
  forms/vector_forms.cpp
  ginv/accumulation.cpp
  ginv/addition.cpp
  ginv/api.cpp
  ginv/hermite.cpp
  ginv/inversion.cpp
  ginv/orthogonal.cpp
  ginv/pivots.cpp
  ginv/update.cpp
  iterative/api.cpp
  iterative/conjugate_gradients.cpp
  trace/api.cpp
  trace/inverse_pattern.cpp
  trace/product.cpp
  trace/trace.cpp)
target_include_directories(qxesm_objects PUBLIC ${PROJECT_SOURCE_DIR}/include PRIVATE ${PROJECT_SOURCE_DIR})
target_compile_options(qxesm_objects PRIVATE $<$<COMPILE_LANGUAGE:CXX>:-fno-exceptions -fno-rtti>)
target_link_libraries(qxesm_objects PRIVATE qxesm_options)

add_library(qxesm SHARED)
add_library(qxesm::qxesm ALIAS qxesm)
target_sources(qxesm PUBLIC FILE_SET HEADERS BASE_DIRS ${PROJECT_SOURCE_DIR}/include FILES
  include/qxesm/cholesky.h include/qxesm/forms.h include/qxesm/ginv.h include/qxesm/host.h include/qxesm/instance.h
  include/qxesm/iterative.h include/qxesm/matrix.h include/qxesm/qxesm.h include/qxesm/status.h
  include/qxesm/store.h include/qxesm/trace.h include/qxesm/types.h)
target_link_libraries(qxesm PRIVATE qxesm_objects qxesm_options BLAS::BLAS m)
set_target_properties(qxesm PROPERTIES SOVERSION 1 LINK_DEPENDS ${PROJECT_SOURCE_DIR}/qxesm.map)
target_link_options(qxesm PRIVATE -Wl,--version-script=${PROJECT_SOURCE_DIR}/qxesm.map -Wl,--as-needed
  # Its own calls stay inside, whatever else the process has loaded under these names.
  -Wl,-Bsymbolic-functions)
if(NOT QXESM_SANITIZE)
  target_link_options(qxesm PRIVATE -Wl,-z,defs)
endif()

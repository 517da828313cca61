// The function table, in slot order.
#include "frame/instance.hpp"

namespace sm {

void fill_table(SmFunctionTable& table) {
  table = SmFunctionTable{
      .qxsmDestroyInstance = qxsmDestroyInstance,
      .qxsmnew = qxsmnew,
      .qxsmDestroyMatrix = qxsmDestroyMatrix,
      .qxsmclose = qxsmclose,
      .qxsmdelete = qxsmdelete,
      .qxsmresize = qxsmresize,
      .qxsmzscp = qxsmzscp,
      .qxsmsoldirect = qxsmsoldirect,
      .qxsmsolioc = qxsmsolioc,
      .qxsmAddSS = qxsmAddSS,
      .qxsmAddSS_10 = qxsmAddSS,
      .qxsmassign = qxsmassign,
      .qxsmget = qxsmget,
      .qxsminvdiag = qxsminvdiag,
      .qxsminv = qxsminv,
      .qxsmUpdateGinv = qxsmUpdateGinv,
      .qxsmsetee = qxsmsetee,
      .qxsmpivot = qxsmpivot,
      .qxsmcke = qxsmcke,
      .qxsminvquad = qxsminvquad,
      .qxsminvquadv = qxsminvquadv,
      .qxsmquad = qxsmquad,
      .qxsmquadv = qxsmquadv,
      .qxsmsubst = qxsmsubst,
      .qxsmhermite = qxsmhermite,
      .qxsmdense = qxsmdense,
      .qxsmlogdet = qxsmlogdet,
      .qxsmrank = qxsmrank,
      .qxsmtrace = qxsmtrace,
      .qxsmtraceAB = qxsmtraceAB,
      .qxsmdiag = qxsmdiag,
      .qxsmmults = qxsmmults,
      .qxsmIsDiag = qxsmIsDiag,
      .qxsmDenseQuad = qxsmDenseQuad,
      .qxsmvaxpy = qxsmvaxpy,
      .qxsmbilin = qxsmbilin,
      .qxsmclone = qxsmclone,
      .qxsmconvert = qxsmconvert,
      .qxsmfact = qxsmfact,
      .qxsmnewss = qxsmnewss,
      .qxsmnewds = qxsmnewds,
      .qxsmnewsg = qxsmnewsg,
      .qxsmnewsd = qxsmnewsd,
  };
}

}  // namespace sm

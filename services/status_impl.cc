#include "services/status_impl.h"

namespace Com::Tarsel::Orna::Kms::StatusSvc {

void StatusImpl::get(::Lumo::AsyncResult<Info> result) { result.SetResult(Info{}); }

}  // namespace Com::Tarsel::Orna::Kms::StatusSvc

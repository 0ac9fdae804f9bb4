// StatusImpl of the host status service: being able to answer is the whole
// check, so get always reports HEALTHY with no messages. Stateless.
#pragma once

#include "services/status_svc.h"

namespace Com::Tarsel::Orna::Kms::StatusSvc {

class StatusImpl : public AsyncServiceInterface {
 public:
  void get(::Lumo::AsyncResult<Info> result) override;
};

}  // namespace Com::Tarsel::Orna::Kms::StatusSvc

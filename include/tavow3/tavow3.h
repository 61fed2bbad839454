// Umbrella header: every public header of libtavow3.
#ifndef TAVOW3_TAVOW3_H_
#define TAVOW3_TAVOW3_H_

#include <tavow3/export.h>
#include <tavow3/engine.h>
#include <tavow3/resource.h>
#include <tavow3/engine_v2.h>
#include <tavow3/engine_c.h>
#include <tavow3/w3base.h>
#include <tavow3/wwwservice.h>
#include <tavow3/port_validator.h>
#include <tavow3/tls_registration.h>
#include <tavow3/validator.h>
#include <tavow3/lock.h>
#include <tavow3/nginx_conf_type.h>
#include <tavow3/nginx_mode_recorder.h>
#include <tavow3/nginx_fw_strategy.h>
#include <tavow3/gen_nginx_conf.h>
#include <tavow3/gen_w3_conf.h>
#include <tavow3/nginx_conf_deployer.h>
#include <tavow3/nginx_conf_policy.h>
#include <tavow3/nginx_conf_operator.h>
#include <tavow3/nginx_conf_operators.h>
#include <tavow3/vantoro_proxy_operators.h>
#include <tavow3/nginx_conf_manager.h>
#include <tavow3/zam.h>

#endif  // TAVOW3_TAVOW3_H_

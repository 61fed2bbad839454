#include <tavow3/w3base.h>

#include <tavo/tlib_service.h>

#include <tavow3/engine_v2.h>
#include <tavow3/nginx_conf_manager.h>

#include "base/file_io.h"
#include "base/log.h"
#include "engine/engine_private.h"

namespace tavow3 {
namespace {

constexpr char kLogTag[] = "tavow3.cpp";

enum EngineKind { kEngine = 0, kEngineV2 = 1 };

// Holds the engine's lock exclusive for its lifetime and returns it to shared
// on every way out, exceptions included.
class ExclusiveSection {
 public:
  explicit ExclusiveSection(Engine::Private* engine) : engine_(engine), locked_(engine->lock()) {}
  ~ExclusiveSection() { engine_->unlock(); }
  ExclusiveSection(const ExclusiveSection&) = delete;
  ExclusiveSection& operator=(const ExclusiveSection&) = delete;
  bool locked() const { return locked_; }

 private:
  Engine::Private* engine_;
  bool locked_;
};

}  // namespace

struct W3Base::Private {
  std::unique_ptr<Engine> engine;       // set for kind kEngine
  std::unique_ptr<EngineV2> engine_v2;  // set for kind kEngineV2
  int kind = kEngine;
  bool ok = false;
  bool dirty = false;
};

W3Base::W3Base(Engine engine) : d_(new Private) {
  d_->engine.reset(new Engine(std::move(engine)));
}

W3Base::W3Base(EngineV2 engine) : d_(new Private) {
  d_->engine_v2.reset(new EngineV2(std::move(engine)));
  d_->kind = kEngineV2;
}

W3Base::~W3Base() = default;

void W3Base::SetOK(bool ok) { d_->ok = ok; }
void W3Base::SetDirty(bool dirty) { d_->dirty = dirty; }
bool W3Base::OK() const { return d_->ok; }
bool W3Base::Dirty() const { return d_->dirty; }

Engine W3Base::engine() const {
  return d_->kind == kEngineV2 ? d_->engine_v2->engine() : *d_->engine;
}

EngineV2 W3Base::engine_v2() const {
  return d_->engine_v2 ? *d_->engine_v2 : EngineV2(*d_->engine);
}

bool W3Base::Get() {
  SetOK(false);
  DataInit();
  if (engine().impl().lock_fd < 0) {
    TAVOW3_LOG_ERR("libtavow3 failed on read file lock, default value used.");
    return false;
  }
  Json::Value value;
  if (GetJson(value)) {
    TransJsonToVar(value);
    SetOK(true);
    return true;
  }
  if (OK()) return true;
  DataInit();
  return false;
}

bool W3Base::Save() {
  Engine handle = engine();
  Engine::Private& engine_private = handle.impl();
  if (engine_private.lock_fd < 0) {
    TAVOW3_LOG_ERR("libtavow3 failed on read file lock, cancel saving.");
    return false;
  }
  ExclusiveSection section(&engine_private);
  if (!section.locked()) {
    TAVOW3_LOG_ERR("libtavow3 failed on write file lock, cancel saving.");
    return false;
  }
  Json::Value value;
  if (!TransVarToJson(value)) return false;
  return SetJson(value);
}

bool W3Base::Set() {
  if (!Save()) return false;
  return RestartService();
}

bool W3Base::RestartService() { return TLIBServiceReload("nginx") == 0; }

bool W3Base::Update() {
  NginxConfManager manager(NGINXCONF_GEN_NGINX_CONF);
  if (manager.run() != 0) {
    (void)base::Unlink("/var/tmp/nginx/nginx.conf");
    return false;
  }
  return engine().W3FwReGenAll() == 1;
}

}  // namespace tavow3

#include <tavow3/gen_w3_conf.h>

#include <tavow3/engine_v2.h>

GenW3Conf::GenW3Conf() : firewall_ok_(false), certificate_ok_(false) {
  tavow3::EngineV2 engine;
  engine.load();
  firewall_ok_ = engine.W3FwReGenAll() != 0;
  certificate_ok_ = engine.W3SyncCrtInfo();
  if (firewall_ok_ && certificate_ok_) gen_ = std::make_unique<GenNginxConf>();
}

GenW3Conf::~GenW3Conf() = default;

bool GenW3Conf::TestNginxTmpConf() { return gen_ != nullptr && gen_->TestNginxTmpConf(); }

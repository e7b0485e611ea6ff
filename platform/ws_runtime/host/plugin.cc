#include "plugin.h"

#include <dlfcn.h>

namespace ws::host {

namespace {

std::string loaderText() {
  const char* text = dlerror();
  return text != nullptr ? text : "no reason given";
}

template <typename Fn>
bool resolve(void* handle, const std::string& path, const std::string& name, Fn& fn,
             std::string& error) {
  dlerror();
  void* symbol = dlsym(handle, name.c_str());
  if (symbol == nullptr) {
    error = "dlsym(\"" + name + "\") in " + path + " failed: " + loaderText();
    return false;
  }
  fn = reinterpret_cast<Fn>(symbol);
  return true;
}

}  // namespace

std::unique_ptr<Plugin> Plugin::load(const std::string& path, const std::string& service,
                                     std::string& error) {
  void* handle = dlopen(path.c_str(), RTLD_NOW | RTLD_LOCAL);
  if (handle == nullptr) {
    error = "dlopen(\"" + path + "\", RTLD_NOW) failed: " + loaderText();
    return nullptr;
  }
  std::unique_ptr<Plugin> plugin(new Plugin(handle));
  const bool resolved = resolve(handle, path, service + "Init", plugin->init_, error) &&
                        resolve(handle, path, service + "Run", plugin->run_, error) &&
                        resolve(handle, path, service + "Pause", plugin->pause_, error) &&
                        resolve(handle, path, service + "Resume", plugin->resume_, error) &&
                        resolve(handle, path, service + "Finalize", plugin->finalize_, error);
  if (!resolved) return nullptr;
  return plugin;
}

Plugin::~Plugin() { dlclose(handle_); }

}  // namespace ws::host

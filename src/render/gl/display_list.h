#pragma once
// Cached drawing as an OpenGL display list, created lazily in the current
// context and freed by its owner. A list made in one context serves every
// context of its share group; in a context of another group it is compiled
// anew (the old list is released in its own group).

#include <utility>

#include "render/gl/gl_name.h"

namespace cloudreel::gl {

class DisplayList {
 public:
  DisplayList() = default;

  // Records what `draw` issues into a new list in the current context,
  // replacing the list held so far. Answers false, recording nothing, if no
  // context is current.
  template <typename Draw>
  bool compile(Draw&& draw) {
    return record(std::forward<Draw>(draw), GL_COMPILE);
  }
  // As compile, and what is recorded is drawn in the same pass.
  template <typename Draw>
  bool compileAndExecute(Draw&& draw) {
    return record(std::forward<Draw>(draw), GL_COMPILE_AND_EXECUTE);
  }

  // Calls the list, compiling it from `draw` first when there is none that
  // the current context can use.
  template <typename Draw>
  void callOrCompile(Draw&& draw) {
    if (isUsable() || compile(std::forward<Draw>(draw))) {
      call();
    }
  }

  // Calls the list if the current context can use it; does nothing otherwise.
  void call() const;
  // True if a list exists and the current context can use it.
  bool isUsable() const { return list_.usableInCurrentContext(); }
  // Forgets the list so the next callOrCompile records it again (the
  // drawing it caches has changed).
  void invalidate() { list_.reset(); }
  GLuint name() const { return list_.get(); }

 private:
  template <typename Draw>
  bool record(Draw&& draw, GLenum mode) {
    if (!beginCompile(mode)) {
      return false;
    }
    std::forward<Draw>(draw)();
    endCompile();
    return true;
  }
  bool beginCompile(GLenum mode);
  void endCompile();

  GLName list_;
};

}  // namespace cloudreel::gl

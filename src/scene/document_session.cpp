#include "scene/document_session.h"

#include <algorithm>
#include <sstream>

#include "platform/user_defaults.h"
#include "scene/my_document.h"

namespace cloudreel {

DocumentSession::DocumentSession(int untitledNumber)
    : DocumentSession(std::make_shared<MyDocument>(), untitledNumber) {}

DocumentSession::DocumentSession(std::shared_ptr<MyDocument> document, int untitledNumber)
    : document_(std::move(document)), untitledNumber_(std::max(1, untitledNumber)) {
  document_->undoManager().setChangeHandler(
      [this](UndoManager::Change change) { undoHistoryChanged(change); });
}

std::unique_ptr<DocumentSession> DocumentSession::open(const std::filesystem::path& url,
                                                       Error* error) {
  std::unique_ptr<DocumentSession> session(new DocumentSession(std::make_shared<MyDocument>(), 1));
  if (!session->document_->readFromURLError(url, error)) {
    return nullptr;
  }
  session->fileURL_ = url;
  session->markSaved();
  return session;
}

DocumentSession::~DocumentSession() { document_->undoManager().setChangeHandler(nullptr); }

std::string DocumentSession::displayName() const {
  if (fileURL_) {
    return fileURL_->filename().string();
  }
  return untitledNumber_ == 1 ? std::string("Untitled")
                              : "Untitled " + std::to_string(untitledNumber_);
}

void DocumentSession::undoHistoryChanged(UndoManager::Change change) {
  const bool wasEdited = isDocumentEdited();
  switch (change) {
    case UndoManager::Change::Done:
      // Below the saved state the redo steps that led back to it are gone.
      if (changeCount_ < 0) {
        savedStateLost_ = true;
      }
      ++changeCount_;
      break;
    case UndoManager::Change::Undone:
      --changeCount_;
      break;
    case UndoManager::Change::Redone:
      ++changeCount_;
      break;
    case UndoManager::Change::Cleared:
      if (changeCount_ != 0) {
        savedStateLost_ = true;
      }
      break;
  }
  editedMayHaveChanged(wasEdited);
}

void DocumentSession::markSaved() {
  const bool wasEdited = isDocumentEdited();
  changeCount_ = 0;
  savedStateLost_ = false;
  editedMayHaveChanged(wasEdited);
}

void DocumentSession::editedMayHaveChanged(bool wasEdited) {
  if (wasEdited != isDocumentEdited() && editedHandler_) {
    editedHandler_();
  }
}

SavePanel DocumentSession::savePanel() const {
  std::string name = displayName();
  if (!fileURL_) {
    name += ".";
    name += kDocumentExtension;
  }
  return SavePanel{"Save", name, std::string(kDocumentExtension)};
}

Alert DocumentSession::closeAlert() const {
  return Alert{"Do you want to save the changes made to the document \u201c" + displayName() +
                   "\u201d?",
               "Your changes will be lost if you don't save them.",
               {"Save", "Cancel", "Don't Save"}};
}

Alert DocumentSession::revertAlert() const {
  return Alert{"Do you want to revert to the most recently saved version of the document \u201c" +
                   displayName() + "\u201d?",
               "Your current changes will be lost.",
               {"Revert", "Cancel"}};
}

bool DocumentSession::saveToURL(const std::filesystem::path& url, Error* error) {
  if (!document_->writeToURLError(url, error)) {
    return false;
  }
  fileURL_ = url;
  markSaved();
  return true;
}

bool DocumentSession::save(Error* error) {
  if (!fileURL_) {
    return saveAs(error);
  }
  return saveToURL(*fileURL_, error);
}

bool DocumentSession::saveAs(Error* error) {
  const auto chosen = UserInteraction::shared().runSavePanel(savePanel());
  if (!chosen) {
    return false;
  }
  return saveToURL(*chosen, error);
}

bool DocumentSession::revertToSaved(Error* error) {
  if (!fileURL_ || !isDocumentEdited()) {
    return false;
  }
  if (UserInteraction::shared().runAlert(revertAlert()) != 0) {
    return false;
  }
  // A file that cannot be read leaves the document as it was (the read
  // changes nothing on failure), still edited.
  if (!document_->readFromURLError(*fileURL_, error)) {
    return false;
  }
  markSaved();
  return true;
}

bool DocumentSession::canClose() {
  if (!isDocumentEdited()) {
    return true;
  }
  const int answer = UserInteraction::shared().runAlert(closeAlert());
  if (answer == 2) {
    return true;  // Don't Save
  }
  if (answer != 0) {
    return false;  // Cancel
  }
  Error error;
  if (save(&error)) {
    return true;
  }
  if (!error.message.empty()) {
    UserInteraction::shared().presentError(error);
  }
  return false;
}

std::string menuItemTitleForStep(std::string_view verb, std::string_view actionName) {
  std::string title(verb);
  if (!actionName.empty()) {
    title += ' ';
    title += actionName;
  }
  return title;
}

// --- RecentDocuments

std::vector<std::filesystem::path> RecentDocuments::urls() const {
  std::vector<std::filesystem::path> urls;
  std::istringstream lines(defaults_.stringForKey(kDefaultsKey));
  std::string line;
  while (std::getline(lines, line) && urls.size() < kMaximumCount) {
    if (!line.empty()) {
      urls.emplace_back(line);
    }
  }
  return urls;
}

void RecentDocuments::noteURL(const std::filesystem::path& url) {
  const std::filesystem::path absolute = std::filesystem::absolute(url).lexically_normal();
  // One path a line: a path holding a line break cannot be listed, and is
  // left out rather than split into two wrong entries.
  if (absolute.string().find('\n') != std::string::npos) {
    return;
  }
  std::vector<std::filesystem::path> list = urls();
  std::erase(list, absolute);
  list.insert(list.begin(), absolute);
  if (list.size() > kMaximumCount) {
    list.resize(kMaximumCount);
  }
  store(list);
}

void RecentDocuments::clear() { store({}); }

void RecentDocuments::store(const std::vector<std::filesystem::path>& urls) {
  std::string joined;
  for (const auto& url : urls) {
    joined += url.string();
    joined += '\n';
  }
  defaults_.setObjectForKey(joined, kDefaultsKey);
}

}  // namespace cloudreel

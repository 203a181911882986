#pragma once
// A document as a desktop front end keeps it open: its file and the name its
// windows show, the edited mark that follows the undo history, and the
// decisions of New, Open, Save, Save As, Revert and Close: what to ask the
// user (through UserInteraction) and what to do with the answer. The windows
// only show the name and the mark and call these.

#include <filesystem>
#include <functional>
#include <memory>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

#include "platform/error.h"
#include "platform/undo_manager.h"
#include "platform/user_interaction.h"

namespace cloudreel {

class MyDocument;
class UserDefaults;

class DocumentSession {
 public:
  // A new, empty document; the number gives its name ("Untitled",
  // "Untitled 2", ...).
  explicit DocumentSession(int untitledNumber);
  // Reads the document at `url`; null, with the error, when it cannot be
  // read.
  static std::unique_ptr<DocumentSession> open(const std::filesystem::path& url, Error* error);
  ~DocumentSession();
  DocumentSession(const DocumentSession&) = delete;
  DocumentSession& operator=(const DocumentSession&) = delete;

  const std::shared_ptr<MyDocument>& document() const { return document_; }
  const std::optional<std::filesystem::path>& fileURL() const { return fileURL_; }
  // The file's name without its folder, or the untitled name.
  std::string displayName() const;

  // Edited while the history is away from where it was when last saved or
  // opened: a change marks it, undoing that change clears it again. A change
  // made after undoing past the saved state can never come back to it.
  bool isDocumentEdited() const { return savedStateLost_ || changeCount_ != 0; }
  // Called whenever isDocumentEdited may have changed (the window's mark).
  void setEditedHandler(std::function<void()> handler) { editedHandler_ = std::move(handler); }

  // Save: to the file it came from; an untitled document asks where first.
  // Answers whether it was saved; a cancelled panel is NO without an error.
  bool save(Error* error);
  // Save As: always asks; the document takes the new file.
  bool saveAs(Error* error);
  bool saveToURL(const std::filesystem::path& url, Error* error);
  // Revert: for an edited document with a file, asks, then reads the file
  // again; the history is forgotten. Answers whether it was read again.
  bool revertToSaved(Error* error);

  // Whether the document may close now: an unedited one may; an edited one
  // asks Save / Cancel / Don't Save, and Save must succeed (a failed save is
  // presented). Answers NO when the user keeps the document open.
  bool canClose();

  // The panels' and alerts' texts, for the front end's tests.
  Alert closeAlert() const;
  Alert revertAlert() const;
  SavePanel savePanel() const;

 private:
  explicit DocumentSession(std::shared_ptr<MyDocument> document, int untitledNumber);
  void undoHistoryChanged(UndoManager::Change change);
  // Back at the saved state: after opening, reading again or saving.
  void markSaved();
  void editedMayHaveChanged(bool wasEdited);

  std::shared_ptr<MyDocument> document_;
  std::optional<std::filesystem::path> fileURL_;
  int untitledNumber_ = 1;
  // Steps done minus steps undone since the saved state; once a change is
  // made below it (or the history is forgotten away from it), the saved
  // state is lost until the next save.
  int changeCount_ = 0;
  bool savedStateLost_ = false;
  std::function<void()> editedHandler_;
};

// The title of an Undo or Redo menu item: the verb and the step's name
// ("Undo New Layer"), or the verb alone for a step without one.
std::string menuItemTitleForStep(std::string_view verb, std::string_view actionName);

// The Open Recent list, newest first, kept in the user defaults so that it
// outlives the application.
class RecentDocuments {
 public:
  static constexpr std::size_t kMaximumCount = 10;
  static constexpr std::string_view kDefaultsKey = "recentDocumentURLs";

  explicit RecentDocuments(UserDefaults& defaults) : defaults_(defaults) {}
  std::vector<std::filesystem::path> urls() const;
  // Moves the file to the front (adding it when new), keeping the list to
  // kMaximumCount.
  void noteURL(const std::filesystem::path& url);
  void clear();

 private:
  void store(const std::vector<std::filesystem::path>& urls);

  UserDefaults& defaults_;
};

}  // namespace cloudreel

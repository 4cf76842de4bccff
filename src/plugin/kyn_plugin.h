/* The C interface of the kyn-assistant plug-in (libkyn-assistant.so), for assistants that load it
 * with dlopen. Every function may be called from any thread; none throws or aborts. Texts are UTF-8.
 * The command and reply formats are documented in the README ("Commands" and "Reply dictionaries"). */
#ifndef KYN_PLUGIN_H
#define KYN_PLUGIN_H

#include <stddef.h>

#ifdef __cplusplus
extern "C" {
#endif

/* Receives the one reply to a command: the reply dictionary as a JSON text, valid during the call. */
typedef void (*kyn_reply_callback)(const char* reply_json, void* context);

/* Receives every log line: level 0 debug, 1 info, 2 default, 3 error. */
typedef void (*kyn_log_callback)(int level, const char* message, void* context);

/* The plug-in's version, such as "0.1.0". */
const char* kyn_plugin_version(void);

/* Sets the configuration directory (NULL: $XDG_CONFIG_HOME/kyn-assistant) and the assistant's
 * language as a BCP 47 tag (NULL: config.json's, else the system's). Call it before the first
 * command, or while no command is in flight. Returns 0, or -1 for a directory that does not exist. */
int kyn_plugin_configure(const char* config_dir, const char* language);

/* The assistant's language in effect, as a BCP 47 tag ("de-CH"): the one given to
 * kyn_plugin_configure, else config.json's, else the system's; "" when none is known. Free the text
 * with kyn_plugin_free. */
char* kyn_plugin_language(void);

/* The minimum level of log lines: "debug", "info", "default", "error" or "off". Returns 0, or -1
 * for another word. */
int kyn_plugin_set_log_level(const char* level);

/* Sends log lines to `callback` (NULL: back to the journal, or standard error without one). */
void kyn_plugin_set_log_callback(kyn_log_callback callback, void* context);

/* Performs an assistant command given as JSON, {"class": "AXKynSearch", ...}. Returns 0 when it was
 * taken: `reply` is then called exactly once, before this function returns (a command that does not
 * parse or is over 1 MiB, names an unknown class or fails validation) or later on the plug-in's
 * network thread.
 * Returns -1, and never calls `reply`, only when `command_json` or `reply` is NULL. */
int kyn_plugin_perform(const char* command_json, kyn_reply_callback reply, void* context);

/* Describes a friend location of a search reply (an "AXKynLocation" object as JSON) for display, in
 * the assistant's language with the conventions and units of the system's region: a JSON object
 * {"name", "handle", "place", "age", "spokenAge", "time", "distance"} (absent members left out).
 * "time" is when the friend was located: a time of day today, the word for yesterday, or a date and
 * time before that. "distance" is how far the friend is from `current_location_json` (the user's
 * position as an "AXLocation" object with its latitude and longitude; NULL: no distance), such as
 * "1.2 km away". `located` is non-zero once the search has ended. Free the text with
 * kyn_plugin_free. NULL for a location text that is no JSON object. */
char* kyn_plugin_describe_location(const char* location_json, int located, const char* current_location_json);

/* The contact picture of the friend of a friend location (an "AXKynLocation" object as JSON): the
 * full picture of the friend's contact in the address book, as the card stores it (JPEG, PNG, ...).
 * Returns the bytes, their count in *size and the picture's width and height in pixels in *width and
 * *height (each pointer may be NULL). NULL when the friend has no picture that decodes, or for a
 * text that is no JSON object. Free the bytes with kyn_plugin_free. */
unsigned char* kyn_plugin_friend_picture(const char* location_json, size_t* size, int* width, int* height);

/* The people of the user's address book whose name holds `name`, ignoring case: a JSON array of
 * "AXPerson" objects with their e-mail addresses and phone numbers, for turning a spoken name into a
 * person. Free the text with kyn_plugin_free. NULL for a NULL name. */
char* kyn_plugin_find_people(const char* name);

/* The person of the user's address book who holds `handle`, an e-mail address (compared without
 * regard to case) or a phone number (compared as the address book compares numbers): an "AXPerson"
 * object as JSON with names, identifier, e-mail addresses and phone numbers, as an assistant hands a
 * resolved person to a command. NULL when no contact holds the handle, or for a NULL handle. Free the
 * text with kyn_plugin_free. */
char* kyn_plugin_find_person(const char* handle);

/* What kyn_plugin_sign_in returns. */
enum {
  KYN_SIGN_IN_OK = 0,
  KYN_SIGN_IN_BAD_PERSON_ID = 1, /* empty, too long, or holds control characters */
  KYN_SIGN_IN_BAD_USERNAME = 2,
  KYN_SIGN_IN_BAD_HOST = 3,      /* not host or host:port (a DNS name, an IPv4 or [IPv6] address) */
  KYN_SIGN_IN_BAD_TOKEN = 4,     /* empty, too long, or holds blanks or control characters */
  KYN_SIGN_IN_NOT_WRITTEN = 5    /* the files could not be written (the log says why) */
};

/* Signs an account in: writes account.json and the owner-only token file of the configuration
 * directory (made when missing). Both files are written completely before either replaces the old
 * one, so wrong input or a failed write leaves the previous account as it was. The token is never
 * logged. */
int kyn_plugin_sign_in(const char* person_id, const char* username, const char* host, const char* token);

/* The signed-in account as JSON, without the token: {"personId", "username", "serviceHost",
 * "provisioned", "restricted", "token": "readable" or "unreadable"} (absent members left out). NULL
 * when no account file is there. Free the text with kyn_plugin_free. */
char* kyn_plugin_account(void);

/* Signs out: removes account.json and the token file. Returns 0, or 1 when no one was signed in. */
int kyn_plugin_sign_out(void);

/* Frees a text or picture returned by the plug-in. */
void kyn_plugin_free(void* memory);

/* Completes every command in flight (as failed) and stops the network thread; call it before
 * dlclose. A later command starts the thread again. */
void kyn_plugin_shutdown(void);

#ifdef __cplusplus
}
#endif

#endif /* KYN_PLUGIN_H */

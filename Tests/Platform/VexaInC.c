/* The public headers in C11: this file is compiled with every warning an error, and uses values and
 * events as a plain C program would. */
#include <vexa/vexa.h>

#include <string.h>

/* The line of the first expectation that was not met, or 0. */
int vexa_in_c(void);

#define EXPECT(condition)                  \
    do {                                   \
        if (!(condition)) return __LINE__; \
    } while (0)

static int use_values(void) {
    vexa_value* const number = vexa_value_create_signed(-5);
    vexa_value* const text = vexa_value_create_string("five", 4);
    EXPECT(number != NULL && text != NULL);
    const vexa_member members[] = {{"word", 4, text}, {"number", 6, number}};
    vexa_value* const dictionary = vexa_value_create_dictionary_of(members, 2);
    EXPECT(dictionary != NULL);
    vexa_value_release(number);
    vexa_value_release(text);

    EXPECT(vexa_value_get_type(dictionary) == VEXA_VALUE_DICTIONARY);
    EXPECT(vexa_value_get_count(dictionary) == 2);
    const size_t place = vexa_value_find_key(dictionary, "number", 6);
    EXPECT(place == 0);
    int64_t content = 0;
    EXPECT(vexa_value_get_signed(vexa_value_get_element(dictionary, place), &content));
    EXPECT(content == -5);
    EXPECT(strcmp(vexa_value_get_key(dictionary, 1, NULL), "word") == 0);

    vexa_value* const description = vexa_value_create_description(dictionary);
    EXPECT(strcmp(vexa_value_get_string(description, NULL),
                  "{\"number\": -5, \"word\": \"five\"}") == 0);
    vexa_value_release(description);
    vexa_value_release(dictionary);
    return 0;
}

static int use_events(void) {
    const vexa_digitizer_record record = {.timestamp = 1, .event_mask = 2, .y = 3.0};
    vexa_event* const event = vexa_event_create_digitizer(&record);
    EXPECT(event != NULL);
    vexa_event_set_phase(event, VEXA_EVENT_PHASE_BEGAN);
    vexa_event_set_integer(event, VEXA_EVENT_FIELD_DIGITIZER_FRAME_NUMBER, 4);
    EXPECT(vexa_event_get_type(event) == VEXA_EVENT_TYPE_DIGITIZER);
    vexa_value* const description = vexa_event_create_description(event);
    EXPECT(strcmp(vexa_value_get_string(description, NULL),
                  "digitizer timestamp=1 phase=began frameNumber=4 eventMask=0x2 y=3.0") == 0);
    vexa_value_release(description);
    vexa_event_release(event);
    return 0;
}

int vexa_in_c(void) {
    EXPECT(vexa_abi_version() == VEXA_ABI_VERSION);
    EXPECT(vexa_abi_serves(VEXA_ABI_VERSION));
    const int64_t values = vexa_live_objects(VEXA_OBJECT_VALUE);
    const int64_t events = vexa_live_objects(VEXA_OBJECT_EVENT);
    const int wrong_value = use_values();
    const int wrong_event = use_events();
    EXPECT(vexa_live_objects(VEXA_OBJECT_VALUE) == values || wrong_value != 0);
    EXPECT(vexa_live_objects(VEXA_OBJECT_EVENT) == events || wrong_event != 0);
    return wrong_value != 0 ? wrong_value : wrong_event;
}

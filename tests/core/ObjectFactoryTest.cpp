#include <gtest/gtest.h>

#include <memory>

#include "core/ObjectFactory.h"

namespace {

struct Widget {
    std::string param;
    static int calls;
    static Widget* create(const std::string& text) {
        ++calls;
        return text == "{\"fail\":1}" ? nullptr : new Widget{text};
    }
};
int Widget::calls = 0;

class WidgetFactory : public ObjectFactory<Widget> {
public:
    WidgetFactory() { creators["PLAIN_WIDGET"] = &Widget::create; }
};

}  // namespace

TEST(ObjectFactory, HandsTheCreatorTheRawParamTextOrGivesNull) {
    struct Case {
        const char* description;
        int calls;          // creator calls expected
        std::string param;  // "<null>": no object
    };
    for (const Case& c : {Case{"{  \"name\" : \"PLAIN_WIDGET\",   \"param\" : { \"k\" : [1, 2] }}", 1, "{ \"k\" : [1, 2] }"},
                          Case{"{\"name\":\"PLAIN_WIDGET\"}", 1, ""},
                          Case{"{\"name\":\"PLAIN_WIDGET\",\"param\":{\"fail\":1}}", 1, "<null>"},
                          Case{"{\"name\":\"OTHER\",\"param\":{}}", 0, "<null>"},
                          Case{"{\"name\":\"plain_widget\"}", 0, "<null>"}, Case{"{}", 0, "<null>"}}) {
        SCOPED_TRACE(c.description);
        const int before = Widget::calls;
        std::unique_ptr<Widget> w(WidgetFactory().createInstance(c.description));
        EXPECT_EQ(Widget::calls - before, c.calls);
        EXPECT_EQ(w ? w->param : "<null>", c.param);
    }
    for (const char* text : {"", " {\"name\":\"PLAIN_WIDGET\"}", "{\"name\":PLAIN_WIDGET}"})
        EXPECT_THROW(WidgetFactory().createInstance(text), JsonError) << text;
}

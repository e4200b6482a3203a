package android.content;

/** Host stand-in for the application context the media engine keeps. */
public class Context {
    private final String name;

    public Context(String name) {
        this.name = name;
    }

    @Override
    public String toString() {
        return "Context(" + name + ")";
    }
}

export { default as MarkdownIt } from "markdown-it";

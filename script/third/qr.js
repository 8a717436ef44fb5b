export { default as qrcode } from "qrcode-generator";

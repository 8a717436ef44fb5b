// What the visitor's page needs to know of the appliance.
var visitorDefinitions = { program: "/cgi-bin/share", receiver: "/cgi-bin/send", pageSize: 500 };

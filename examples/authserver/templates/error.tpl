{{%AUTOESCAPE context="HTML"}}
<!DOCTYPE html>
<html lang="en">
<head>
{{>HEAD}}
<title>This does not work</title>
</head>
<body>
<main>
<h1>This does not work</h1>
<p class="error" role="alert">{{REASON}}</p>
<p>Nothing was passed on. Go back to the application that you came from and begin again; if that does not help, tell its makers: <code>{{CODE}}</code>.</p>
</main>
</body>
</html>

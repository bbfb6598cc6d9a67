import { Alert, AlertActionLink } from '@patternfly/react-core/dist/esm/components/Alert';
import { Component, type ReactNode } from 'react';
import { t } from '../texts';

// Shows an error in the page itself in place of the view that has it, so that the rest stays usable. A view's files
// that are gone, as after an update of the appliance, come here, too.
export class Boundary extends Component<{ children: ReactNode }, { failed: boolean }> {
  override state = { failed: false };

  static getDerivedStateFromError() {
    return { failed: true };
  }

  override render() {
    if (!this.state.failed) return this.props.children;
    return (
      <div role="alert">
        <Alert
          isInline
          variant="danger"
          component="h1"
          title={t('app.broken')}
          actionLinks={
            <AlertActionLink onClick={() => window.location.reload()}>{t('app.reload')}</AlertActionLink>
          }
        >
          {t('app.broken.body')}
        </Alert>
      </div>
    );
  }
}
